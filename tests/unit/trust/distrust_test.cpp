// The reach of the user's distrust of a certificate.
#include <gtest/gtest.h>

#include "scene.h"
#include "support/key_forms.h"

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
            {"PinnedServer", ServerChain(kHost), *pinnedServerPolicy(kHost)},
            {"CompatibilityServer", ServerChain(kHost), *compatibilityServerPolicy(kHost)},
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

TEST_P(Distrust, HoldsUnderAnotherSubject) {
    CertificateFields renamed = fields.leaf;
    renamed.subject = test::commonName("Another");
    EXPECT_EQ(verdictWithout(issueCertificate(renamed, &intermediate).der), Verdict::deny);
    scene.list.front() = issueCertificate(renamed, &intermediate).der;
    EXPECT_EQ(verdictWithout(leaf.der), Verdict::deny);
}

TEST_P(Distrust, IsNotOfANamesake) {
    CertificateFields namesake = fields.leaf;
    namesake.key = SigningKey::cached(KeyKind::p256, "namesake");
    EXPECT_EQ(verdictWithout(issueCertificate(namesake, &intermediate).der), Verdict::unspecified);
}

/// A leaf with another encoding of its key, and with another name and serial number.
Data inAnotherForm(const ChainFields& fields, const IssuedCertificate& issuer, Data (*form)(ByteView)) {
    CertificateFields odd = fields.leaf;
    odd.subject = test::commonName("Another");
    odd.serial += 100;
    odd.edit = [form](test::CertificateElements& all) { all.key = form(all.key); };
    return issueCertificate(odd, &issuer).der;
}

TEST_P(Distrust, HoldsForThePointInEveryForm) {
    for (const auto form : {test::compressedPoint, test::hybridPoint, test::onDescribedCurve}) {
        const Data odd = inAnotherForm(fields, intermediate, form);
        scene.list.front() = leaf.der;
        EXPECT_EQ(verdictWithout(odd), Verdict::deny) << "the deny file holds the odd form";
        scene.list.front() = odd;
        EXPECT_EQ(verdictWithout(leaf.der), Verdict::deny) << "the chain holds the odd form";
    }
}

TEST_P(Distrust, HoldsForAnRsaKeyUnderPss) {
    fields.leaf.key = SigningKey::cached(KeyKind::rsa2048, "leaf");
    Scene rsa(fields);
    const Data odd = inAnotherForm(fields, intermediate, test::asPssKey);
    const Data ordinary = rsa.list.front();
    rsa.denied = {odd};
    EXPECT_EQ(rsa.verdict(GetParam().policy), Verdict::deny);
    rsa.list.front() = odd;
    rsa.denied = {ordinary};
    EXPECT_EQ(rsa.verdict(GetParam().policy), Verdict::deny);
}

TEST_P(Distrust, HoldsForTheKeyOfAnAuthorityInEveryForm) {
    for (const auto form : {test::compressedPoint, test::hybridPoint, test::onDescribedCurve}) {
        CertificateFields odd = fields.intermediate;
        odd.edit = [form](test::CertificateElements& all) { all.key = form(all.key); };
        EXPECT_EQ(verdictWithout(issueCertificate(odd, &root).der), Verdict::deny);
    }
}

TEST_P(Distrust, HoldsForTheKeyOfACertificateThatIsRefused) {
    for (const int version : {1, 4}) {
        CertificateFields refused = fields.leaf;
        refused.version = version;
        const Data der = issueCertificate(refused, &intermediate).der;
        ASSERT_EQ(X509Certificate::parse(der), nullptr);
        EXPECT_EQ(verdictWithout(der), Verdict::deny);
    }
}

INSTANTIATE_TEST_SUITE_P(Of, Distrust, testing::ValuesIn(everyPolicy()),
                         [](const auto& tested) { return std::string(tested.param.name); });

}  // namespace
}  // namespace pinwell::trust
