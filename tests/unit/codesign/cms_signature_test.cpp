#include "codesign/cms_signature.h"

#include <gtest/gtest.h>

#include "codesign/code_error.h"
#include "support/cms_signer.h"

namespace pinwell::test {
namespace {

using codesign::secureTimestamp;
using foundation::Date;

const Data kSignedContent = foundation::toData("a code directory");
constexpr Date kStampedAt{1795204500};

bool verifyDetachedCms(ByteView cms, ByteView content) {
    try {
        codesign::requireDetachedCms(cms, content);
        return true;
    } catch (const codesign::CodeError& error) {
        EXPECT_EQ(error.status(), codesign::kInvalidSignature);
        return false;
    }
}

TEST(CmsSignature, VerifiesOverItsContent) {
    EXPECT_TRUE(verifyDetachedCms(CmsBuilder(kSignedContent).key(TestKey::ecP256).build(), kSignedContent));
    EXPECT_TRUE(verifyDetachedCms(CmsBuilder(kSignedContent).key(TestKey::rsa2048).build(), kSignedContent));
}

TEST(CmsSignature, VerifiesInBerWithIndefiniteLengths) {
    const Data ber = CmsBuilder(kSignedContent).ber().build();
    ASSERT_EQ(ber[1], std::byte{0x80});
    EXPECT_TRUE(verifyDetachedCms(ber, kSignedContent));
}

TEST(CmsSignature, VerifiesWithoutSignedAttributes) {
    EXPECT_TRUE(
        verifyDetachedCms(CmsBuilder(kSignedContent).withoutSignedAttributes().build(), kSignedContent));
}

TEST(CmsSignature, RefusesOtherContent) {
    const Data other = foundation::toData("another directory");
    EXPECT_FALSE(verifyDetachedCms(CmsBuilder(kSignedContent).build(), other));
    EXPECT_FALSE(verifyDetachedCms(CmsBuilder(kSignedContent).withoutSignedAttributes().build(), other));
    EXPECT_FALSE(verifyDetachedCms(CmsBuilder(kSignedContent).ber().build(), other));
}

TEST(CmsSignature, RefusesABrokenSignature) {
    EXPECT_FALSE(verifyDetachedCms(CmsBuilder(kSignedContent).brokenSignature().build(), kSignedContent));
    EXPECT_FALSE(verifyDetachedCms(CmsBuilder(kSignedContent).key(TestKey::rsa2048).brokenSignature().build(),
                                   kSignedContent));
}

TEST(CmsSignature, RefusesAMessageWithoutTheSignersCertificate) {
    EXPECT_FALSE(verifyDetachedCms(CmsBuilder(kSignedContent).withoutCertificate().build(), kSignedContent));
}

TEST(CmsSignature, RefusesAMessageThatCarriesItsContent) {
    EXPECT_FALSE(verifyDetachedCms(CmsBuilder(kSignedContent).attached().build(), kSignedContent));
}

TEST(CmsSignature, RefusesWhatIsNoSignedData) {
    EXPECT_FALSE(verifyDetachedCms({}, kSignedContent));
    EXPECT_FALSE(verifyDetachedCms(Data(100), kSignedContent));
    EXPECT_FALSE(verifyDetachedCms(foundation::toData("0\x80"), kSignedContent));
    // A ContentInfo of plain data: SEQUENCE { 1.2.840.113549.1.7.1, [0] { OCTET STRING "" } }
    const unsigned char data[] = {0x30, 0x0F, 0x06, 0x09, 0x2A, 0x86, 0x48, 0x86, 0xF7,
                                  0x0D, 0x01, 0x07, 0x01, 0xA0, 0x02, 0x04, 0x00};
    EXPECT_FALSE(verifyDetachedCms(std::as_bytes(std::span(data)), kSignedContent));
}

TEST(CmsSignature, RefusesBytesBehindTheMessage) {
    Data cms = CmsBuilder(kSignedContent).build();
    cms.push_back(std::byte{0});
    EXPECT_FALSE(verifyDetachedCms(cms, kSignedContent));
}

TEST(CmsSignature, EndsCleanlyWhereverItIsCut) {
    for (const Data& whole : {CmsBuilder(kSignedContent).timestamp(TimestampBuilder()).build(),
                              CmsBuilder(kSignedContent).ber().timestamp(TimestampBuilder()).build()}) {
        ASSERT_TRUE(verifyDetachedCms(whole, kSignedContent));
        for (std::size_t length = 0; length < whole.size(); ++length) {
            EXPECT_FALSE(verifyDetachedCms(ByteView(whole).first(length), kSignedContent)) << length;
            EXPECT_EQ(secureTimestamp(ByteView(whole).first(length)), std::nullopt) << length;
        }
    }
}

TEST(SecureTimestamp, IsTheTokensTime) {
    EXPECT_EQ(secureTimestamp(CmsBuilder(kSignedContent).timestamp(TimestampBuilder()).build()), kStampedAt);
    EXPECT_EQ(secureTimestamp(CmsBuilder(kSignedContent).ber().timestamp(TimestampBuilder()).build()),
              kStampedAt);
    EXPECT_EQ(
        secureTimestamp(CmsBuilder(kSignedContent).timestamp(TimestampBuilder().imprintDigest(4)).build()),
        kStampedAt);
}

TEST(SecureTimestamp, MayHaveFractionsOfASecond) {
    const auto token = TimestampBuilder().time("20261120195500.75Z");
    EXPECT_EQ(secureTimestamp(CmsBuilder(kSignedContent).timestamp(token).build()), kStampedAt);
}

TEST(SecureTimestamp, LeavesTheSignatureAsItWas) {
    EXPECT_TRUE(
        verifyDetachedCms(CmsBuilder(kSignedContent).timestamp(TimestampBuilder()).build(), kSignedContent));
    const auto broken = TimestampBuilder().brokenSignature();
    EXPECT_TRUE(verifyDetachedCms(CmsBuilder(kSignedContent).timestamp(broken).build(), kSignedContent));
}

TEST(SecureTimestamp, IsNothingWithoutAToken) {
    EXPECT_EQ(secureTimestamp(CmsBuilder(kSignedContent).build()), std::nullopt);
    EXPECT_EQ(secureTimestamp({}), std::nullopt);
}

TEST(SecureTimestamp, IsNothingWhenTheTokenIsBroken) {
    const auto stamped = [](const TimestampBuilder& token) {
        return secureTimestamp(CmsBuilder(kSignedContent).timestamp(token).build());
    };
    EXPECT_EQ(stamped(TimestampBuilder().brokenSignature()), std::nullopt);
    EXPECT_EQ(stamped(TimestampBuilder().withoutCertificate()), std::nullopt);
    EXPECT_EQ(stamped(TimestampBuilder().asPlainData()), std::nullopt);
    EXPECT_EQ(stamped(TimestampBuilder().time("20261399999999Z")), std::nullopt);
}

TEST(SecureTimestamp, IsNothingWhenTheImprintIsOfAnotherSignature) {
    const auto token = TimestampBuilder().imprintOf(foundation::toData("another signature value"));
    EXPECT_EQ(secureTimestamp(CmsBuilder(kSignedContent).timestamp(token).build()), std::nullopt);
}

TEST(SecureTimestamp, IsNothingWhenTwoTokensDisagree) {
    const Data cms = CmsBuilder(kSignedContent)
                         .timestamp(TimestampBuilder())
                         .timestamp(TimestampBuilder().time("20200101000000Z"))
                         .build();
    EXPECT_EQ(secureTimestamp(cms), std::nullopt);
}

}  // namespace
}  // namespace pinwell::test
