#include "codesign/cms_signature.h"

#include <gtest/gtest.h>

#include "cms_fixture.h"
#include "codesign/code_error.h"

namespace pinwell::test {
namespace {

using codesign::secureTimestamp;
using values::Date;

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
    EXPECT_TRUE(verifyDetachedCms(CmsBuilder(kContent).key(TestKey::ecP256).build(), kContent));
    EXPECT_TRUE(verifyDetachedCms(CmsBuilder(kContent).key(TestKey::rsa2048).build(), kContent));
}

TEST(CmsSignature, VerifiesInBerWithIndefiniteLengths) {
    const Data ber = CmsBuilder(kContent).ber().build();
    ASSERT_EQ(ber[1], std::byte{0x80});
    EXPECT_TRUE(verifyDetachedCms(ber, kContent));
}

TEST(CmsSignature, VerifiesWithoutSignedAttributes) {
    EXPECT_TRUE(verifyDetachedCms(CmsBuilder(kContent).withoutSignedAttributes().build(), kContent));
}

TEST(CmsSignature, RefusesOtherContent) {
    const Data other = base::toData("another directory");
    EXPECT_FALSE(verifyDetachedCms(CmsBuilder(kContent).build(), other));
    EXPECT_FALSE(verifyDetachedCms(CmsBuilder(kContent).withoutSignedAttributes().build(), other));
    EXPECT_FALSE(verifyDetachedCms(CmsBuilder(kContent).ber().build(), other));
}

TEST(CmsSignature, RefusesABrokenSignature) {
    EXPECT_FALSE(verifyDetachedCms(CmsBuilder(kContent).brokenSignature().build(), kContent));
    EXPECT_FALSE(
        verifyDetachedCms(CmsBuilder(kContent).key(TestKey::rsa2048).brokenSignature().build(), kContent));
}

TEST(CmsSignature, RefusesAMessageWithoutTheSignersCertificate) {
    EXPECT_FALSE(verifyDetachedCms(CmsBuilder(kContent).withoutCertificate().build(), kContent));
}

TEST(CmsSignature, RefusesAMessageThatCarriesItsContent) {
    EXPECT_FALSE(verifyDetachedCms(CmsBuilder(kContent).attached().build(), kContent));
}

TEST(CmsSignature, RefusesOtherContentThanSignedData) {
    EXPECT_FALSE(verifyDetachedCms({}, kContent));
    EXPECT_FALSE(verifyDetachedCms(Data(100), kContent));
    EXPECT_FALSE(verifyDetachedCms(base::toData("0\x80"), kContent));
    // A ContentInfo of plain data: SEQUENCE { 1.2.840.113549.1.7.1, [0] { OCTET STRING "" } }
    const unsigned char data[] = {0x30, 0x0F, 0x06, 0x09, 0x2A, 0x86, 0x48, 0x86, 0xF7,
                                  0x0D, 0x01, 0x07, 0x01, 0xA0, 0x02, 0x04, 0x00};
    EXPECT_FALSE(verifyDetachedCms(std::as_bytes(std::span(data)), kContent));
}

TEST(CmsSignature, RefusesBytesAfterTheMessage) {
    Data cms = CmsBuilder(kContent).build();
    cms.push_back(std::byte{0});
    EXPECT_FALSE(verifyDetachedCms(cms, kContent));
}

TEST(CmsSignature, EndsCleanlyWhereverItIsCut) {
    for (const Data& whole : {CmsBuilder(kContent).timestamp(TimestampBuilder()).build(),
                              CmsBuilder(kContent).ber().timestamp(TimestampBuilder()).build()}) {
        ASSERT_TRUE(verifyDetachedCms(whole, kContent));
        for (std::size_t length = 0; length < whole.size(); ++length) {
            EXPECT_FALSE(verifyDetachedCms(ByteView(whole).first(length), kContent)) << length;
            EXPECT_EQ(secureTimestamp(ByteView(whole).first(length)), std::nullopt) << length;
        }
    }
}

TEST(SecureTimestamp, IsTheTokensTime) {
    EXPECT_EQ(secureTimestamp(CmsBuilder(kContent).timestamp(TimestampBuilder()).build()), kStampedAt);
    EXPECT_EQ(secureTimestamp(CmsBuilder(kContent).ber().timestamp(TimestampBuilder()).build()), kStampedAt);
    EXPECT_EQ(secureTimestamp(CmsBuilder(kContent).timestamp(TimestampBuilder().imprintDigest(4)).build()),
              kStampedAt);
}

TEST(SecureTimestamp, MayHaveFractionsOfASecond) {
    const auto token = TimestampBuilder().time("20261120195500.75Z");
    EXPECT_EQ(secureTimestamp(CmsBuilder(kContent).timestamp(token).build()), kStampedAt);
}

TEST(SecureTimestamp, LeavesTheSignatureAsItWas) {
    EXPECT_TRUE(verifyDetachedCms(CmsBuilder(kContent).timestamp(TimestampBuilder()).build(), kContent));
    const auto broken = TimestampBuilder().brokenSignature();
    EXPECT_TRUE(verifyDetachedCms(CmsBuilder(kContent).timestamp(broken).build(), kContent));
}

TEST(SecureTimestamp, IsNothingWithoutAToken) {
    EXPECT_EQ(secureTimestamp(CmsBuilder(kContent).build()), std::nullopt);
    EXPECT_EQ(secureTimestamp({}), std::nullopt);
}

TEST(SecureTimestamp, IsNothingWhenTheTokenIsBroken) {
    const auto stamped = [](const TimestampBuilder& token) {
        return secureTimestamp(CmsBuilder(kContent).timestamp(token).build());
    };
    EXPECT_EQ(stamped(TimestampBuilder().brokenSignature()), std::nullopt);
    EXPECT_EQ(stamped(TimestampBuilder().withoutCertificate()), std::nullopt);
    EXPECT_EQ(stamped(TimestampBuilder().asPlainData()), std::nullopt);
    EXPECT_EQ(stamped(TimestampBuilder().time("20261399999999Z")), std::nullopt);
}

TEST(SecureTimestamp, IsNothingWhenTheImprintIsOfAnotherSignature) {
    const auto token = TimestampBuilder().imprintOf(base::toData("another signature value"));
    EXPECT_EQ(secureTimestamp(CmsBuilder(kContent).timestamp(token).build()), std::nullopt);
}

TEST(SecureTimestamp, IsNothingWhenTwoTokensDisagree) {
    const Data cms = CmsBuilder(kContent)
                         .timestamp(TimestampBuilder())
                         .timestamp(TimestampBuilder().time("20200101000000Z"))
                         .build();
    EXPECT_EQ(secureTimestamp(cms), std::nullopt);
}

}  // namespace
}  // namespace pinwell::test
