#include "trust/ecdsa.h"

#include <gtest/gtest.h>
#include <openssl/x509.h>

#include "foundation/byte_writer.h"
#include "support/certificate_builder.h"
#include "trust/certificate.h"

namespace pinwell::trust {
namespace {

using foundation::asBytes;
using foundation::ByteWriter;
using test::KeyKind;
using test::SigningKey;

constexpr std::size_t kField = 72;

Data fromHex(std::string_view text) {
    Data data;
    for (std::size_t i = 0; i + 1 < text.size(); i += 2) {
        data.push_back(static_cast<std::byte>(std::stoul(std::string(text.substr(i, 2)), nullptr, 16)));
    }
    return data;
}

// RFC 6979, A.2.5: P-256, SHA-256.
constexpr std::string_view kPublicX = "60FED4BA255A9D31C961EB74C6356D68C049B8923B61FA6CE669622E60F29FB6";
constexpr std::string_view kPublicY = "7903FE1008B8BC99A41AE9E95628BC64F2F1B20C2D7E9F5177A3C294D4462299";
constexpr std::string_view kSampleR = "EFD48B2AACB6A8FD1140DD9CD45E81D69D2C877B56AAF991C34D0EA84EAF3716";
constexpr std::string_view kSampleS = "F7CB1C942D657C41D436C7A1B6E29F65F3E900DBB9AFF4064DC4AB2F843ACDA8";
constexpr std::string_view kTestR = "F1ABB023518351CD71D881567B1EA663ED3EFCF6C5132B354F28D3B0B7D38367";
constexpr std::string_view kTestS = "019F4113742A2B14BD25926B49C649155F267E60D3814B4C0CC84250E46F0083";
constexpr std::string_view kOrder = "FFFFFFFF00000000FFFFFFFFFFFFFFFFBCE6FAADA7179E84F3B9CAC2FC632551";

X509PublicKey sampleKey() {
    const Data info = ByteWriter()
                          .bytes(fromHex("3059301306072A8648CE3D020106082A8648CE3D03010703420004"))
                          .bytes(fromHex(kPublicX))
                          .bytes(fromHex(kPublicY))
                          .data();
    const auto* at = static_cast<const unsigned char*>(static_cast<const void*>(info.data()));
    return X509PublicKey(
        std::shared_ptr<EVP_PKEY>(d2i_PUBKEY(nullptr, &at, static_cast<long>(info.size())), EVP_PKEY_free));
}

X509PublicKey publicKey(KeyKind kind) {
    test::CertificateFields fields;
    fields.key = SigningKey::cached(kind, "signer");
    return X509PublicKey(*X509Certificate::parse(test::issueCertificate(fields, nullptr).der)->publicKey());
}

Data element(std::uint8_t tag, const Data& contents) {
    return ByteWriter().u8(tag).u8(static_cast<std::uint8_t>(contents.size())).bytes(contents).data();
}
Data integer(std::string_view hex) {
    return element(0x02, fromHex(hex));
}
Data positive(std::string_view hex) {
    return integer((hex[0] >= '8' ? "00" : "") + std::string(hex));
}
Data sequence(const Data& first, const Data& second, const Data& behind = {}) {
    return element(0x30, ByteWriter().bytes(first).bytes(second).bytes(behind).data());
}
Data padded(Data signature, std::size_t size = kField) {
    signature.resize(size);
    return signature;
}

bool verifiesSample(const Data& field) {
    return verifyEcdsa(sampleKey(), asBytes("sample"), field);
}

TEST(TicketSignature, VerifiesThePublishedVectors) {
    EXPECT_TRUE(verifiesSample(padded(sequence(positive(kSampleR), positive(kSampleS)))));
    EXPECT_TRUE(
        verifyEcdsa(sampleKey(), asBytes("test"), padded(sequence(positive(kTestR), positive(kTestS)))));
}

TEST(TicketSignature, IsOverTheVeryMessage) {
    EXPECT_FALSE(verifyEcdsa(sampleKey(), asBytes("sampl3"),
                             padded(sequence(positive(kSampleR), positive(kSampleS)))));
}

TEST(TicketSignature, MayFillItsFieldWhole) {
    const Data signature = sequence(positive(kSampleR), positive(kSampleS));
    EXPECT_EQ(signature.size(), kField);
    EXPECT_TRUE(verifiesSample(signature));
}

TEST(TicketSignature, RefusesANonZeroByteBehindIt) {
    Data field = padded(sequence(positive(kTestR), positive(kTestS)));
    ASSERT_TRUE(verifyEcdsa(sampleKey(), asBytes("test"), field));
    field.back() = std::byte{1};
    EXPECT_FALSE(verifyEcdsa(sampleKey(), asBytes("test"), field));
}

TEST(TicketSignature, RefusesAnEmptyField) {
    EXPECT_FALSE(verifiesSample({}));
}

TEST(TicketSignature, RefusesAFieldCutShort) {
    EXPECT_FALSE(verifiesSample(padded(sequence(positive(kSampleR), positive(kSampleS)), kField - 1)));
}

TEST(TicketSignature, RefusesAnotherOuterTag) {
    Data field = padded(sequence(positive(kSampleR), positive(kSampleS)));
    field[0] = std::byte{0x31};
    EXPECT_FALSE(verifiesSample(field));
}

TEST(TicketSignature, RefusesALengthNotInItsShortestForm) {
    const Data contents = ByteWriter().bytes(positive(kTestR)).bytes(positive(kTestS)).data();
    const Data field =
        ByteWriter().u8(0x30).u8(0x81).u8(static_cast<std::uint8_t>(contents.size())).bytes(contents).data();
    EXPECT_FALSE(verifyEcdsa(sampleKey(), asBytes("test"), field));
}

TEST(TicketSignature, RefusesIntegersNotInTheirShortestForm) {
    EXPECT_FALSE(verifyEcdsa(sampleKey(), asBytes("test"),
                             sequence(positive(kTestR), integer("00" + std::string(kTestS)))));
}

TEST(TicketSignature, RefusesNegativeIntegers) {
    EXPECT_FALSE(verifiesSample(padded(sequence(integer(kSampleR), positive(kSampleS)))));
    EXPECT_FALSE(verifiesSample(padded(sequence(positive(kSampleR), integer(kSampleS)))));
}

TEST(TicketSignature, RefusesZero) {
    EXPECT_FALSE(verifiesSample(padded(sequence(integer("00"), positive(kSampleS)))));
    EXPECT_FALSE(verifiesSample(padded(sequence(positive(kSampleR), integer("00")))));
}

TEST(TicketSignature, RefusesEmptyIntegers) {
    EXPECT_FALSE(verifiesSample(padded(sequence(integer(""), positive(kSampleS)))));
}

TEST(TicketSignature, RefusesTheOrderAndAbove) {
    EXPECT_FALSE(verifiesSample(padded(sequence(positive(kOrder), positive(kSampleS)))));
    EXPECT_FALSE(verifiesSample(padded(sequence(positive(kSampleR), positive(kOrder)))));
    // s of the second vector plus the order: congruent, and yet not a signature.
    EXPECT_FALSE(
        verifyEcdsa(sampleKey(), asBytes("test"),
                    sequence(positive(kTestR),
                             integer("01019F4112742A2B15BD25926B49C649151C0D790E7A98E9D100820D13E0D225D4"))));
}

TEST(TicketSignature, RefusesAThirdIntegerAndAMissingOne) {
    EXPECT_FALSE(verifyEcdsa(sampleKey(), asBytes("test"),
                             sequence(positive(kTestR), positive(kTestS), integer("01"))));
    EXPECT_FALSE(verifyEcdsa(sampleKey(), asBytes("test"), sequence(positive(kTestR), {})));
}

TEST(TicketSignature, VerifiesOnOtherCurves) {
    const Data signature = SigningKey::cached(KeyKind::p384, "signer").sign(asBytes("message"));
    EXPECT_TRUE(verifyEcdsa(publicKey(KeyKind::p384), asBytes("message"), signature));
}

TEST(TicketSignature, NeverVerifiesWithAnRsaKey) {
    const Data signature = SigningKey::cached(KeyKind::rsa2048, "signer").sign(asBytes("message"));
    EXPECT_FALSE(verifyEcdsa(publicKey(KeyKind::rsa2048), asBytes("message"), signature));
}

}  // namespace
}  // namespace pinwell::trust
