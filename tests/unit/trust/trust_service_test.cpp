#include "trust/trust_service.h"

#include <gtest/gtest.h>

#include <atomic>
#include <thread>

#include "scene.h"
#include "support/fake_trust_service.h"

namespace pinwell::trust {
namespace {

using test::statusOf;
using test::TicketChain;

Scene brokenLeaf() {
    TicketChain chain;
    chain.leaf.markers.clear();
    return Scene(chain);
}

TEST(Trust, NamesTheCertificateAtFaultAndTheReason) {
    const auto trust = brokenLeaf().trust(ticketPolicy());
    EXPECT_TRUE(trust->evaluate());
    EXPECT_EQ(trust->failureDescription(),
              "Certificate \"Ticket Signer\": the leaf marker 1.2.840.177245.100.6.1.30 is missing");
}

TEST(Trust, HasPropertiesForEachCertificateOfTheChain) {
    const auto trust = brokenLeaf().trust(ticketPolicy());
    EXPECT_TRUE(trust->evaluate());
    const Array expected{Dictionary{{"title", "Ticket Signer"},
                                    {"error", "the leaf marker 1.2.840.177245.100.6.1.30 is missing"}},
                         Dictionary{{"title", "Ticket Intermediate"}}, Dictionary{{"title", "Ticket Root"}}};
    EXPECT_EQ(trust->properties(), expected);
}

TEST(Trust, HasNothingToSayAfterSuccess) {
    const auto trust = Scene(TicketChain()).trust(ticketPolicy());
    EXPECT_TRUE(trust->evaluate());
    EXPECT_EQ(trust->failureDescription(), std::nullopt);
    EXPECT_EQ(trust->properties().size(), 3U);
}

TEST(Trust, HasNeitherKeyNorPropertiesBeforeItsEvaluation) {
    const auto trust = brokenLeaf().trust(ticketPolicy());
    EXPECT_EQ(trust->publicKey(), nullptr);
    EXPECT_TRUE(trust->properties().empty());
    EXPECT_EQ(trust->failureDescription(), std::nullopt);
}

TEST(Trust, ForgetsItsVerdictWithANewPolicy) {
    const auto trust = brokenLeaf().trust(ticketPolicy());
    EXPECT_TRUE(trust->evaluate());
    Policy lenient = ticketPolicy();
    lenient.options.erase(std::string(option::kLeafMarkerOid));
    EXPECT_TRUE(trust->setPolicy(std::make_shared<const Policy>(lenient)));
    EXPECT_EQ(trust->failureDescription(), std::nullopt);
    EXPECT_EQ(trust->publicKey(), nullptr);
    const auto verdict = trust->evaluate();
    ASSERT_TRUE(verdict);
    EXPECT_EQ(*verdict, Verdict::unspecified);
}

TEST(Trust, RefusesToBeWithoutAPolicy) {
    EXPECT_EQ(statusOf(brokenLeaf().trust(ticketPolicy())->setPolicy(nullptr)), kParameterError);
}

TEST(Trust, VerifiesSignaturesWithItsLeafsKey) {
    const Scene scene{TicketChain()};
    const auto trust = scene.trust(ticketPolicy());
    EXPECT_TRUE(trust->evaluate());
    ASSERT_NE(trust->publicKey(), nullptr);
    const auto message = base::asBytes("message");
    Data field = scene.chain.leaf.key.sign(message);
    field.resize(72);
    const PublicKeyRef key = trust->publicKey();
    EXPECT_TRUE(scene.service()->verifySignature(*key, message, field));
    const auto refused = scene.service()->verifySignature(*key, base::asBytes("other"), field);
    ASSERT_FALSE(refused);
    EXPECT_EQ(refused.error().domain(), base::kOSStatusErrorDomain);
    EXPECT_EQ(refused.error().code(), kSignatureError);
}

TEST(TrustCreation, RefusesListsThatAreEmptyTooLongOrForeign) {
    const auto service = Scene(TicketChain()).service();
    const auto policy = std::make_shared<const Policy>(ticketPolicy());
    const CertificateRef one = service->parseCertificate(TicketChain().issue().leaf.der);
    EXPECT_EQ(statusOf(service->makeTrust({}, policy)), kParameterError);
    EXPECT_EQ(statusOf(service->makeTrust({nullptr}, policy)), kParameterError);
    EXPECT_EQ(statusOf(service->makeTrust({one}, nullptr)), kParameterError);
    EXPECT_EQ(statusOf(service->makeTrust({std::make_shared<test::FakeCertificate>(one->der())}, policy)),
              kParameterError);
    EXPECT_EQ(statusOf(service->makeTrust(std::vector(kMaximumCertificates + 1, one), policy)),
              kParameterError);
    EXPECT_EQ(statusOf(service->makeTrust(std::vector(kMaximumCertificates, one), policy)), kSuccess);
}

struct BadOption {
    const char* title;
    std::string_view key;
    values::Value value;
};

class UnjudgeablePolicy : public testing::TestWithParam<BadOption> {};

TEST_P(UnjudgeablePolicy, TrustsNothing) {
    Policy policy = ticketPolicy();
    policy.options.insert_or_assign(std::string(GetParam().key), GetParam().value);
    const auto trust = Scene(TicketChain()).trust(policy);
    const auto verdict = trust->evaluate();
    ASSERT_TRUE(verdict);
    EXPECT_EQ(*verdict, Verdict::otherError);
    EXPECT_NE(trust->failureDescription().value_or("").find(GetParam().key), std::string::npos);
}

INSTANTIATE_TEST_SUITE_P(
    Option, UnjudgeablePolicy,
    testing::Values(BadOption{"Unknown", "Unknown", true}, BadOption{"SwitchAsNumber", option::kIdLinkage, 1},
                    BadOption{"SwitchAsText", option::kBasicConstraints, "true"},
                    BadOption{"SwitchAsNil", option::kCriticalExtensions, nullptr},
                    BadOption{"AnchorAsSwitch", option::kPlatformAnchor, true},
                    BadOption{"AnchorWithSubOption", option::kPlatformAnchor,
                              Dictionary{{"AnyAnchor", true}}},
                    BadOption{"ChainLengthAsSwitch", option::kChainLength, true},
                    BadOption{"ChainLengthAsText", option::kChainLength, "3"},
                    BadOption{"MarkerAsNumber", option::kLeafMarkerOid, 1},
                    BadOption{"NoMarkers", option::kLeafMarkerOid, Array{}},
                    BadOption{"NumberAmongMarkers", option::kIntermediateMarkerOid, Array{"1.2.3", 4}},
                    BadOption{"KeySizeAsNumber", option::kKeySize, 2048},
                    BadOption{"KeySizeOfTexts", option::kKeySize, Dictionary{{"RSA", "2048"}}},
                    BadOption{"EmptyHost", option::kHostName, ""}),
    [](const auto& row) { return row.param.title; });

TEST(PolicyOption, ThatIsNotInTheListIsNotChecked) {
    TicketChain chain;
    chain.leaf.subject.clear();
    chain.leaf.extensions = {{"1.2.3.4", true}};
    chain.intermediate.basicConstraints.reset();
    chain.leaf.key = test::SigningKey::cached(test::KeyKind::p224, "leaf");
    chain.leaf.authorityKeyIdentifier = test::KeyIdentifier::given("another");
    EXPECT_EQ(Scene(chain).verdict({"1.2.3", std::nullopt, {}}), Verdict::unspecified);
}

TEST(PolicyOption, ThatIsFalseIsNotChecked) {
    TicketChain chain;
    chain.leaf.subject.clear();
    Policy policy = ticketPolicy();
    policy.options.insert_or_assign(std::string(option::kNonEmptySubject), false);
    EXPECT_EQ(Scene(chain).verdict(policy), Verdict::unspecified);
}

TEST(PolicyOption, WithoutAnyAnchorOptionMeansThePlatformsOwn) {
    Scene scene{TicketChain()};
    scene.roots.clear();
    EXPECT_EQ(scene.verdict({"1.2.3", std::nullopt, {}}), Verdict::recoverableFailure);
}

TEST(PolicyOption, OfSeveralMarkersRequiresAll) {
    Policy policy = ticketPolicy();
    policy.options.insert_or_assign(std::string(option::kLeafMarkerOid),
                                    Array{test::kTicketLeafMarker, "1.2.3"});
    EXPECT_EQ(Scene(TicketChain()).verdict(policy), Verdict::recoverableFailure);
    TicketChain both;
    both.leaf.markers.emplace_back("1.2.3");
    EXPECT_EQ(Scene(both).verdict(policy), Verdict::unspecified);
}

TEST(ServerPolicy, IsNotMadeForAnEmptyHost) {
    EXPECT_EQ(pinnedServerPolicy(""), nullptr);
    EXPECT_EQ(compatibilityServerPolicy(""), nullptr);
}

TEST(ServerPolicy, AcceptsAnAddressThatTheCertificateNames) {
    EXPECT_EQ(Scene(test::ServerChain("127.0.0.1")).verdict(*pinnedServerPolicy("127.0.0.1")),
              Verdict::unspecified);
    EXPECT_EQ(Scene(test::ServerChain("::1")).verdict(*pinnedServerPolicy("::1")), Verdict::unspecified);
}

TEST(TrustService, ReadsItsAnchorsOnceAndOnlyWhenNeeded) {
    const test::IssuedChain chain = TicketChain().issue();
    std::atomic<int> loads = 0;
    const auto service = makeTrustService(
        [&] {
            ++loads;
            return Anchors{{X509Certificate::parse(chain.root.der)}, {}, {}, {}};
        },
        [] { return kNow; });
    std::vector<CertificateRef> list;
    for (const Data& der : chain.list()) list.push_back(service->parseCertificate(der));
    const auto policy = std::make_shared<const Policy>(ticketPolicy());
    EXPECT_EQ(loads, 0);
    std::vector<std::thread> threads;
    std::atomic<int> trusted = 0;
    for (int i = 0; i < 4; ++i) {
        threads.emplace_back([&] {
            const auto trust = service->makeTrust(list, policy);
            const auto verdict = trust ? (*trust)->evaluate() : trust.error();
            if (verdict && *verdict == Verdict::unspecified) ++trusted;
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(loads, 1);
    EXPECT_EQ(trusted, 4);
}

}  // namespace
}  // namespace pinwell::trust
