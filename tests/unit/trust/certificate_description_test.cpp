#include "trust/certificate_description.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>

#include "support/certificate_builder.h"

namespace pinwell::trust {
namespace {

using test::CertificateFields;
using test::KeyKind;
using test::SigningKey;
using testing::Contains;
using testing::Field;
using testing::SizeIs;

CertificateDescription describe(const test::IssuedCertificate& certificate) {
    return describeCertificate(certificate.der).value();
}

TEST(CertificateDescription, NamesSubjectAndIssuerWithAllTheirParts) {
    const test::IssuedChain chain = test::TicketChain().issue();
    const CertificateDescription leaf = describe(chain.leaf);
    EXPECT_EQ(leaf.issuer, describe(chain.intermediate).subject);
    EXPECT_FALSE(leaf.isSelfIssued);
    EXPECT_TRUE(describe(chain.root).isSelfIssued);
    EXPECT_TRUE(describe(chain.intermediate).isCertificateAuthority);
    EXPECT_FALSE(leaf.isCertificateAuthority);

    CertificateFields fields;
    fields.subject = {{"O", "Ostrel"}, {"CN", "Caf\xc3\xa9"}};
    EXPECT_EQ(describe(issueCertificate(fields, nullptr)).subject, "CN=Caf\xc3\xa9,O=Ostrel");
}

TEST(CertificateDescription, LetsNoControlCharacterOfANameThrough) {
    CertificateFields fields;
    fields.subject = {{"CN", "a\x1b[31m\nb"}};
    const std::string subject = describe(issueCertificate(fields, nullptr)).subject;
    EXPECT_TRUE(std::none_of(subject.begin(), subject.end(), [](char c) { return c == '\x1b' || c == '\n'; }))
        << subject;
}

TEST(CertificateDescription, SaysWhichKindOfKeyItIs) {
    CertificateFields fields;
    fields.key = SigningKey::cached(KeyKind::p384, "described");
    const CertificateDescription curve = describe(issueCertificate(fields, nullptr));
    EXPECT_EQ(curve.keyType, "EC");
    EXPECT_EQ(curve.keyBits, 384);
    EXPECT_EQ(curve.curve, "secp384r1");
    EXPECT_EQ(curve.signatureAlgorithm, "ecdsa-with-SHA256");
    fields.key = SigningKey::cached(KeyKind::rsa2048, "described");
    const CertificateDescription rsa = describe(issueCertificate(fields, nullptr));
    EXPECT_EQ(rsa.keyType, "RSA");
    EXPECT_EQ(rsa.keyBits, 2048);
    EXPECT_EQ(rsa.curve, "");
}

TEST(CertificateDescription, ListsEveryExtensionAndMarksTheMalformed) {
    CertificateFields fields;
    fields.markers = {test::kTicketLeafMarker};
    fields.extensions = {{.oid = "1.2.3.4", .critical = true},
                         {.oid = "2.5.29.15", .value = base::toData("?")}};
    const CertificateDescription description = describe(issueCertificate(fields, nullptr));
    using Extension = CertificateDescription::Extension;
    EXPECT_THAT(description.extensions, Contains(Field(&Extension::oid, test::kTicketLeafMarker)));
    const auto named = [&](std::string_view oid) {
        return *std::find_if(description.extensions.begin(), description.extensions.end(),
                             [&](const Extension& one) { return one.oid == oid; });
    };
    EXPECT_TRUE(named("1.2.3.4").critical);
    EXPECT_FALSE(named("1.2.3.4").malformed);
    EXPECT_TRUE(named("2.5.29.15").malformed);
}

TEST(CertificateDescription, GivesDatesSerialNumberAndFingerprints) {
    CertificateFields fields;
    fields.serial = 0x1234;
    const test::IssuedCertificate certificate = issueCertificate(fields, nullptr);
    const CertificateDescription description = describe(certificate);
    EXPECT_EQ(description.serialNumber, "1234");
    EXPECT_EQ(description.notBefore, fields.notBefore);
    EXPECT_EQ(description.notAfter, fields.notAfter);
    EXPECT_THAT(description.sha1Fingerprint, SizeIs(20));
    EXPECT_THAT(description.sha256Fingerprint, SizeIs(32));
    EXPECT_TRUE(description.subjectKeyIdentifier);
    EXPECT_NE(description.sha256Fingerprint, describe(test::TicketChain().issue().leaf).sha256Fingerprint);
}

TEST(CertificateDescription, DescribesNothingThatIsNoCertificate) {
    base::Data der = test::TicketChain().issue().leaf.der;
    EXPECT_TRUE(describeCertificate(der));
    der.push_back(std::byte{0});
    EXPECT_FALSE(describeCertificate(der));
    EXPECT_FALSE(describeCertificate({}));
}

}  // namespace
}  // namespace pinwell::trust
