#include <gtest/gtest.h>

#include "formats/satchel.h"
#include "support/fake_trust_service.h"

namespace pinwell {
namespace {

namespace status = satchel_status;

using test::FakeTrustService;
using values::Array;
using values::Dictionary;
using values::Value;

TEST(TicketPolicy, IsThePlatformSecurityLibrarysWhenThatHasOne) {
    FakeTrustService service;
    service.libraryPolicy = std::make_shared<trust::Policy>(trust::Policy{"1.2.3", "theirs", {}});
    trust::PolicyRef policy;
    EXPECT_EQ(_satchel_create_cert_policy(&policy, service), status::kSuccess);
    EXPECT_EQ(policy, service.libraryPolicy);
    EXPECT_EQ(service.namedPolicyRequests,
              std::vector<std::string>{"SecPolicyCreateOstrelQuillonPlusTicket"});
}

TEST(TicketPolicy, IsNothingWhenTheNamedConstructorReturnsNothing) {
    FakeTrustService service;
    service.libraryPolicy = trust::PolicyRef();
    trust::PolicyRef policy = std::make_shared<trust::Policy>();
    EXPECT_EQ(_satchel_create_cert_policy(&policy, service), status::kNoPolicy);
    EXPECT_EQ(policy, nullptr);
}

TEST(TicketPolicy, HasExactlyTheseOptionsWhenItIsMadeHere) {
    FakeTrustService service;
    service.libraryPolicy = std::nullopt;
    trust::PolicyRef policy;
    ASSERT_EQ(_satchel_create_cert_policy(&policy, service), status::kSuccess);
    ASSERT_NE(policy, nullptr);
    EXPECT_EQ(policy->oid, "1.2.840.177245.100.1.90");
    EXPECT_EQ(policy->name, "1.2.840.177245.100.1.90");
    const Dictionary expected{
        {"CriticalExtensions", true},
        {"IdLinkage", true},
        {"BasicConstraints", true},
        {"NonEmptySubject", true},
        {"PlatformAnchor", Dictionary{}},
        {"ChainLength", std::int64_t{3}},
        {"IntermediateMarkerOid", "1.2.840.177245.100.6.2.17"},
        {"LeafMarkerOid", "1.2.840.177245.100.6.1.30"},
        {"KeySize", Dictionary{{"RSA", std::int64_t{2048}}, {"EC", std::int64_t{256}}}},
    };
    EXPECT_EQ(policy->options, expected);
}

TEST(FusedOption, IsAddedWhereThereIsNone) {
    Dictionary options;
    EXPECT_EQ(_satchel_fuse_option(options, "key", "value"), status::kSuccess);
    EXPECT_EQ(options, (Dictionary{{"key", "value"}}));
}

TEST(FusedOption, MakesAListOfTwoSingleValues) {
    Dictionary options{{"key", "old"}, {"other", true}};
    EXPECT_EQ(_satchel_fuse_option(options, "key", "new"), status::kSuccess);
    EXPECT_EQ(options, (Dictionary{{"key", Array{"old", "new"}}, {"other", true}}));
}

TEST(FusedOption, MakesAListOfTwoDictionaries) {
    const Dictionary old{{"RSA", 2048}};
    const Dictionary added{{"EC", 256}};
    Dictionary options{{"key", old}};
    EXPECT_EQ(_satchel_fuse_option(options, "key", added), status::kSuccess);
    EXPECT_EQ(options, (Dictionary{{"key", Array{old, added}}}));
}

TEST(FusedOption, LengthensACopyOfAList) {
    const Value list = Array{"first", "second"};
    Dictionary options{{"key", list}};
    EXPECT_EQ(_satchel_fuse_option(options, "key", "third"), status::kSuccess);
    EXPECT_EQ(options, (Dictionary{{"key", Array{"first", "second", "third"}}}));
    EXPECT_EQ(list, Value(Array{"first", "second"}));
}

TEST(MadePolicy, NeedsAnIdentifierAndOptions) {
    const std::string text = "1.2.3";
    const Dictionary options{{"key", true}};
    EXPECT_EQ(satchel_make_policy(nullptr, &text, &options), nullptr);
    EXPECT_EQ(satchel_make_policy(&text, &text, nullptr), nullptr);
}

TEST(MadePolicy, MayHaveNoName) {
    const std::string oid = "1.2.3";
    const Dictionary options{{"key", true}};
    const trust::PolicyRef policy = satchel_make_policy(&oid, nullptr, &options);
    ASSERT_NE(policy, nullptr);
    EXPECT_EQ(policy->oid, "1.2.3");
    EXPECT_EQ(policy->name, std::nullopt);
    EXPECT_EQ(policy->options, options);
}

}  // namespace
}  // namespace pinwell
