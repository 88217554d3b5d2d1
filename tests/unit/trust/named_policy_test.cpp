#include "trust/trust_service.h"

#include <gtest/gtest.h>
#include <stdio.h>

#include <array>
#include <optional>

#include "pinwell/ostrel_security.h"
#include "scene.h"
#include "support/process.h"

namespace pinwell::trust {
namespace {

constexpr const char* kConstructor = "SecPolicyCreateOstrelQuillonPlusTicket";

std::optional<PolicyRef> lookUp(const std::string& sort) {
    return namedPolicy(std::string(SECURITY_LIBRARIES) + "/" + sort + "/libostrelsecurity.so.1",
                       kConstructor);
}

/// Null if there is none.
PolicyRef found(const std::string& sort) {
    return lookUp(sort).value_or(nullptr);
}

const std::optional<PolicyRef> kUnavailablePolicy = std::nullopt;
const std::optional<PolicyRef> kRefusedPolicy = PolicyRef();

std::string probe(const std::string& directory) {
    const std::string command =
        "LD_LIBRARY_PATH='" + directory + "' " + test::emulator() + " '" + NAMED_POLICY_PROBE + "'";
    FILE* const pipe = popen(command.c_str(), "r");
    std::array<char, 256> line{};
    const std::size_t size = fread(line.data(), 1, line.size(), pipe);
    EXPECT_EQ(pclose(pipe), 0);
    return {line.data(), size};
}

TEST(NamedPolicy, IsCopiedFromTheLibrary) {
    const PolicyRef policy = found("good");
    ASSERT_NE(policy, nullptr);
    EXPECT_EQ(policy->oid, "1.2.840.177245.100.1.90");
    EXPECT_EQ(policy->name, "ticket signing");
    const Dictionary expected{{"CriticalExtensions", true},
                              {"ChainLength", 3},
                              {"IntermediateMarkerOid", "1.2.840.177245.100.6.2.17"},
                              {"LeafMarkerOid", Array{"1.2.840.177245.100.6.1.30"}},
                              {"KeySize", Dictionary{{"RSA", 2048}, {"EC", 256}}},
                              {"PlatformAnchor", Dictionary{}}};
    EXPECT_EQ(policy->options, expected);
}

TEST(NamedPolicy, JudgesChains) {
    const PolicyRef policy = found("good");
    ASSERT_NE(policy, nullptr);
    EXPECT_EQ(Scene(test::TicketChain()).verdict(*policy), Verdict::unspecified);
    EXPECT_EQ(Scene(test::ServerChain()).verdict(*policy), Verdict::recoverableFailure);
}

TEST(NamedPolicy, OfAnAbsentLibraryIsUnavailable) {
    EXPECT_EQ(lookUp("absent"), kUnavailablePolicy);
}

TEST(NamedPolicy, ThatTheLibraryDoesNotKnowIsUnavailable) {
    EXPECT_EQ(lookUp("nameless"), kUnavailablePolicy);
}

TEST(NamedPolicy, ThatIsNullIsARefusal) {
    EXPECT_EQ(lookUp("refusing"), kRefusedPolicy);
}
TEST(NamedPolicy, OfAnotherVersionIsARefusal) {
    EXPECT_EQ(lookUp("future"), kRefusedPolicy);
}
TEST(NamedPolicy, WithAValueOfUnknownTypeIsARefusal) {
    EXPECT_EQ(lookUp("wrong_type"), kRefusedPolicy);
}

TEST(NamedPolicy, WithAnUnknownOptionTrustsNothing) {
    const PolicyRef policy = found("unknown_option");
    ASSERT_NE(policy, nullptr);
    EXPECT_EQ(Scene(test::TicketChain()).verdict(*policy), Verdict::otherError);
}

TEST(NamedPolicy, IsFoundByTheDynamicLoadersRules) {
    EXPECT_EQ(probe(std::string(SECURITY_LIBRARIES) + "/good"), "created 1.2.840.177245.100.1.90");
    EXPECT_EQ(probe(std::string(SECURITY_LIBRARIES) + "/refusing"), "refused");
    EXPECT_EQ(probe(std::string(SECURITY_LIBRARIES) + "/nameless"), "unavailable");
    EXPECT_EQ(probe("/nonexistent"), "unavailable");
}

/// A policy object with one option, to be spoilt.
struct Object {
    ostrel_policy_option option{"ChainLength", OSTREL_OPTION_NUMBER, 0, {}};
    ostrel_policy policy{OSTREL_POLICY_VERSION, 1, "1.2.3", nullptr, &option, nullptr};

    Object() { option.value.number = 3; }
};

TEST(NamedPolicyObject, MayBeWithoutAName) {
    const Object object;
    const PolicyRef policy = convertPolicy(object.policy);
    ASSERT_TRUE(policy);
    EXPECT_EQ(policy->name, std::nullopt);
}

TEST(NamedPolicyObject, NeedsAnOid) {
    Object object;
    object.policy.oid = nullptr;
    EXPECT_FALSE(convertPolicy(object.policy));
}

TEST(NamedPolicyObject, NeedsItsOptions) {
    Object object;
    object.policy.options = nullptr;
    EXPECT_FALSE(convertPolicy(object.policy));
}

TEST(NamedPolicyObject, NeedsKeys) {
    Object object;
    object.option.key = nullptr;
    EXPECT_FALSE(convertPolicy(object.policy));
}

TEST(NamedPolicyObject, HasALimitOnOptions) {
    Object object;
    object.policy.option_count = OSTREL_MAXIMUM_OPTIONS + 1;
    EXPECT_FALSE(convertPolicy(object.policy));
}

TEST(NamedPolicyObject, HasALimitOnEntries) {
    Object object;
    object.option.type = OSTREL_OPTION_STRING_LIST;
    object.option.count = OSTREL_MAXIMUM_ENTRIES + 1;
    EXPECT_FALSE(convertPolicy(object.policy));
}

TEST(NamedPolicyObject, HasALimitOnStrings) {
    Object object;
    const std::string longest(OSTREL_MAXIMUM_STRING, 'x');
    object.policy.oid = longest.c_str();
    EXPECT_TRUE(convertPolicy(object.policy));
    const std::string tooLong(OSTREL_MAXIMUM_STRING + 1, 'x');
    object.policy.oid = tooLong.c_str();
    EXPECT_FALSE(convertPolicy(object.policy));
}

TEST(NamedPolicyObject, NeedsTheListThatItCounts) {
    for (const std::uint32_t type :
         {std::uint32_t{OSTREL_OPTION_STRING_LIST}, std::uint32_t{OSTREL_OPTION_NUMBER_DICTIONARY}}) {
        Object object;
        object.option.type = type;
        object.option.count = 1;
        object.option.value.strings = nullptr;
        EXPECT_FALSE(convertPolicy(object.policy));
    }
}

TEST(NamedPolicyObject, HasNoKeyTwice) {
    const Object object;
    const std::array twice{object.option, object.option};
    ostrel_policy policy = object.policy;
    policy.options = twice.data();
    policy.option_count = 2;
    EXPECT_FALSE(convertPolicy(policy));
}

TEST(NamedPolicyObject, HasBooleansThatAreZeroOrOne) {
    Object object;
    object.option.type = OSTREL_OPTION_BOOLEAN;
    EXPECT_FALSE(convertPolicy(object.policy));
}

}  // namespace
}  // namespace pinwell::trust
