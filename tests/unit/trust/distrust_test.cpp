// What the user's distrust of a certificate reaches.
#include <gtest/gtest.h>

#include "scene.h"

namespace pinwell::trust {
namespace {

using test::CertificateFields;
using test::ChainFields;
using test::IssuedCertificate;
using test::KeyKind;
using test::ServerChain;
using test::SigningKey;
using test::TicketChain;
using test::underOtherSignature;

struct Judged {
    const char* name;
    ChainFields fields;
    Policy policy;

    friend void PrintTo(const Judged& one, std::ostream* out) { *out << one.name; }
};

std::vector<Judged> everyPolicy() {
    return {{"Ticket", TicketChain(), ticketPolicy()},
            {"PinnedServer", ServerChain(kHost), *createPinnedServerPolicy(kHost)},
            {"CompatibilityServer", ServerChain(kHost), *createCompatibilityServerPolicy(kHost)},
            {"NoOption", TicketChain(), {"1.2.3", std::nullopt, {}}}};
}

class Distrust : public testing::TestWithParam<Judged> {
  protected:
    Verdict verdictWithout(const Data& denied) {
        scene.denied = {denied};
        return scene.verdict(GetParam().policy);
    }

    ChainFields fields = GetParam().fields;
    Scene scene{fields};
    const IssuedCertificate& leaf = scene.chain.leaf;
    const IssuedCertificate& intermediate = scene.chain.intermediate;
    const IssuedCertificate& root = scene.chain.root;
};

TEST_P(Distrust, ReachesEveryCertificateOfTheChain) {
    EXPECT_EQ(scene.verdict(GetParam().policy), Verdict::unspecified);
    for (const IssuedCertificate* one : {&leaf, &intermediate, &root})
        EXPECT_EQ(verdictWithout(one->der), Verdict::deny) << one->subject.back().second;
}

TEST_P(Distrust, HoldsHoweverTheSignatureIsEncoded) {
    const Data leafTwin = underOtherSignature(leaf.der, intermediate.key);
    const Data intermediateTwin = underOtherSignature(intermediate.der, root.key);
    const Data rootTwin = underOtherSignature(root.der, root.key);
    for (const Data* twin : {&leafTwin, &intermediateTwin, &rootTwin})
        EXPECT_EQ(verdictWithout(*twin), Verdict::deny);

    scene.denied.clear();
    scene.list = {leafTwin, intermediateTwin, root.der};
    EXPECT_EQ(scene.verdict(GetParam().policy), Verdict::unspecified) << "the twins themselves are good";
    for (const IssuedCertificate* one : {&leaf, &intermediate})
        EXPECT_EQ(verdictWithout(one->der), Verdict::deny) << one->subject.back().second;
}

TEST_P(Distrust, HoldsWhenTheSameKeyIsCertifiedAgain) {
    CertificateFields later = fields.leaf;
    later.serial += 100;
    later.notBefore.seconds += kDay;
    scene.list.front() = issueCertificate(later, &intermediate).der;
    EXPECT_EQ(verdictWithout(root.der), Verdict::deny);
    EXPECT_EQ(verdictWithout(leaf.der), Verdict::deny);
}

TEST_P(Distrust, HoldsWhenAnotherAuthorityCertifiesTheSameKey) {
    CertificateFields other = fields.root;
    other.subject = test::commonName("Other Root");
    other.key = SigningKey::cached(KeyKind::p256, "other root");
    const IssuedCertificate otherRoot = issueCertificate(other, nullptr);
    scene.list = {leaf.der, issueCertificate(fields.intermediate, &otherRoot).der};
    scene.roots = {otherRoot.der};
    EXPECT_EQ(scene.verdict(GetParam().policy), Verdict::unspecified);
    EXPECT_EQ(verdictWithout(intermediate.der), Verdict::deny);
}

TEST_P(Distrust, HoldsForAKeyThatCannotBeReadHoweverTheSignatureIsEncoded) {
    fields.leaf.key = SigningKey::cached(KeyKind::p256Described, "described");
    Scene described(fields);
    described.denied = {underOtherSignature(described.chain.leaf.der, described.chain.intermediate.key)};
    EXPECT_EQ(described.verdict(GetParam().policy), Verdict::deny);
}

TEST_P(Distrust, IsOfThisKeyUnderThisName) {
    CertificateFields sameName = fields.leaf;
    sameName.key = SigningKey::cached(KeyKind::p256, "namesake");
    EXPECT_EQ(verdictWithout(issueCertificate(sameName, &intermediate).der), Verdict::unspecified);
    CertificateFields sameKey = fields.leaf;
    sameKey.subject = test::commonName("Another");
    EXPECT_EQ(verdictWithout(issueCertificate(sameKey, &intermediate).der), Verdict::unspecified);
}

INSTANTIATE_TEST_SUITE_P(Of, Distrust, testing::ValuesIn(everyPolicy()),
                         [](const auto& tested) { return std::string(tested.param.name); });

}  // namespace
}  // namespace pinwell::trust
