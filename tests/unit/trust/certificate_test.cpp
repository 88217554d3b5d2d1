#include "trust/certificate.h"

#include <gtest/gtest.h>

#include "foundation/byte_writer.h"
#include "support/certificate_builder.h"

namespace pinwell::trust {
namespace {

using test::CertificateFields;
using test::issueCertificate;

X509CertificateRef made(const CertificateFields& fields) {
    return X509Certificate::parse(issueCertificate(fields, nullptr).der);
}

TEST(Certificate, KeepsItsBytes) {
    const Data der = issueCertificate({}, nullptr).der;
    EXPECT_EQ(X509Certificate::parse(der)->der(), der);
}

TEST(Certificate, IsRefusedWhenCutShortOrFollowedByMore) {
    Data der = issueCertificate({}, nullptr).der;
    for (std::size_t length = 0; length < der.size(); ++length) {
        EXPECT_EQ(X509Certificate::parse(ByteView(der).first(length)), nullptr);
    }
    der.push_back(std::byte{0});
    EXPECT_EQ(X509Certificate::parse(der), nullptr);
}

TEST(Certificate, IsRefusedWithAnIndefiniteLength) {
    Data der = issueCertificate({}, nullptr).der;
    Data indefinite{std::byte{0x30}, std::byte{0x80}};
    foundation::append(indefinite, ByteView(der).subspan(4));
    indefinite.resize(indefinite.size() + 2);
    EXPECT_EQ(X509Certificate::parse(indefinite), nullptr);
}

TEST(Certificate, HasExtensionsInItsThirdVersionOnly) {
    CertificateFields fields;
    EXPECT_NE(made(fields), nullptr);
    for (const int version : {1, 2, 4}) {
        fields.version = version;
        EXPECT_EQ(made(fields), nullptr) << version;
    }
}

TEST(Certificate, MayBeOfAnEarlierVersionWithoutExtensions) {
    CertificateFields fields;
    fields.basicConstraints.reset();
    fields.subjectKeyIdentifier = fields.authorityKeyIdentifier = test::KeyIdentifier::omitted();
    for (const int version : {1, 2}) {
        fields.version = version;
        EXPECT_NE(made(fields), nullptr) << version;
    }
}

TEST(Certificate, HasALimitOnItsSize) {
    const auto sized = [](std::size_t payload) {
        CertificateFields fields;
        fields.extensions = {{"1.2.3.4", false, Data(payload)}};
        return issueCertificate(fields, nullptr).der;
    };
    const std::size_t around = sized(100000).size() - 100000;
    std::size_t payload = kMaximumCertificateSize - around - 2;  // ECDSA signatures differ by a byte or two
    while (sized(payload).size() > kMaximumCertificateSize) --payload;
    const Data fits = sized(payload - 4);
    ASSERT_LE(fits.size(), kMaximumCertificateSize);
    EXPECT_NE(X509Certificate::parse(fits), nullptr);
    EXPECT_EQ(X509Certificate::parse(sized(kMaximumCertificateSize)), nullptr);
}

TEST(CertificateSummary, IsTheCommonName) {
    CertificateFields fields;
    fields.subject = {{"O", "Ostrel"}, {"CN", "Signer"}, {"OU", "Tickets"}};
    EXPECT_EQ(made(fields)->subjectSummary(), "Signer");
}

TEST(CertificateSummary, IsElseTheLastNamedPart) {
    CertificateFields fields;
    fields.subject = {{"O", "Ostrel"}, {"OU", "Tickets"}};
    EXPECT_EQ(made(fields)->subjectSummary(), "Tickets");
}

TEST(CertificateSummary, IsElseTheKeyIdentifier) {
    CertificateFields fields;
    fields.subject.clear();
    fields.subjectKeyIdentifier = test::KeyIdentifier::given("\x01\xAB");
    EXPECT_EQ(made(fields)->subjectSummary(), "01ab");
    fields.subjectKeyIdentifier = test::KeyIdentifier::omitted();
    EXPECT_EQ(made(fields)->subjectSummary().size(), 40U);
}

TEST(CertificateSummary, HoldsNoControlCharacters) {
    CertificateFields fields;
    fields.subject = {{"CN", "a\n\x1b[31m"}};
    EXPECT_EQ(made(fields)->subjectSummary().find_first_of("\n\x1b"), std::string::npos);
}

TEST(Certificate, KnowsTheSizeOfItsKey) {
    CertificateFields fields;
    fields.key = test::SigningKey::cached(test::KeyKind::p384, "key");
    EXPECT_EQ(made(fields)->publicKey()->type(), kKeyTypeEllipticCurve);
    EXPECT_EQ(made(fields)->publicKey()->bits(), 384);
    fields.key = test::SigningKey::cached(test::KeyKind::rsa2048, "key");
    EXPECT_EQ(made(fields)->publicKey()->type(), kKeyTypeRSA);
    EXPECT_EQ(made(fields)->publicKey()->bits(), 2048);
}

TEST(Certificate, HasNoKeyThatBringsItsOwnCurve) {
    CertificateFields fields;
    fields.key = test::SigningKey::cached(test::KeyKind::p256Described, "key");
    ASSERT_NE(made(fields), nullptr);
    EXPECT_EQ(made(fields)->publicKey(), nullptr);
    EXPECT_FALSE(made(fields)->verifiesSignatureOf(*made(fields)));
}

TEST(Certificate, KeepsDatesBeyondTheTwoDigitYears) {
    CertificateFields fields;
    fields.notAfter = {4102444800};  // 2100-01-01
    EXPECT_EQ(made(fields)->notAfter().seconds, 4102444800);
    EXPECT_EQ(made(fields)->notBefore().seconds, 1577836800);
}

}  // namespace
}  // namespace pinwell::trust
