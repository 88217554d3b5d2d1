// The time-stamp token of a signer's message: its bounds and its time.
#include <gtest/gtest.h>

#include "cms_fixture.h"
#include "codesign/cms_message.h"
#include "codesign/cms_signature.h"

namespace pinwell::test {
namespace {

using codesign::kMaximumCertificates;
using codesign::kMaximumDigestAlgorithms;
using codesign::kMaximumRsaBits;
using codesign::secureTimestamp;

constexpr std::string_view kTimeStampToken = "\x2A\x86\x48\x86\xF7\x0D\x01\x09\x10\x02\x0E";

class TokenBounds : public testing::Test {
  protected:
    /// A message with a changed time-stamp token.
    static Data stamped(const std::function<void(CmsParts& token)>& change) {
        CmsParts parts = goodParts();
        const ByteView value = derContents(signerOf(parts).signature);
        CmsParts token = CmsParts::of(TimestampBuilder().build(value));
        change(token);
        signerOf(parts).unsignedAttributes = {attributeOf(kTimeStampToken, {token.build()})};
        return parts.build();
    }
    /// The signature stays the same; the time does not count.
    static void expectNoTime(const std::function<void(CmsParts& token)>& change) {
        const Data message = stamped(change);
        EXPECT_EQ(secureTimestamp(message), std::nullopt);
        EXPECT_NO_THROW(codesign::requireDetachedCms(message, kContent));
    }
};

TEST_F(TokenBounds, AreKeptByAnOrdinaryToken) {
    EXPECT_TRUE(secureTimestamp(stamped([](CmsParts&) {})));
    EXPECT_TRUE(secureTimestamp(stamped([](CmsParts& token) {
        token.digestAlgorithms.resize(kMaximumDigestAlgorithms, token.digestAlgorithms.front());
        token.certificates->resize(kMaximumCertificates, certificateAround(rsaKeyOfExponentOne(1024)));
    })));
}

TEST_F(TokenBounds, HoldForDigestAlgorithmsSignersAndCertificates) {
    expectNoTime([](CmsParts& token) {
        token.digestAlgorithms.resize(kMaximumDigestAlgorithms + 1, token.digestAlgorithms.front());
    });
    expectNoTime([](CmsParts& token) { token.signers.push_back(token.signers.front()); });
    expectNoTime([](CmsParts& token) { token.signers.clear(); });
    expectNoTime([](CmsParts& token) {
        token.certificates->resize(kMaximumCertificates + 1, token.certificates->front());
    });
}

TEST_F(TokenBounds, HoldForTheKey) {
    const auto signedBy = [](std::size_t bits) {
        return [bits](CmsParts& token) {
            const Data content = token.content;
            const auto attributes = signerOf(token).signedAttributes;
            token = signedByExponentOne(bits, derElement(0x31, joined(*attributes)));
            token.content = content;
            signerOf(token).signedAttributes = attributes;
        };
    };
    EXPECT_TRUE(secureTimestamp(stamped(signedBy(kMaximumRsaBits))));
    expectNoTime(signedBy(kMaximumRsaBits + 1));
}

TEST_F(TokenBounds, AreThoseOfAMessageWithContent) {
    expectNoTime([](CmsParts& token) { token.content = derElement(0x30, identifier(kTimeStampContent)); });
    expectNoTime([](CmsParts& token) { signerOf(token).signedAttributes.reset(); });
}

TEST_F(TokenBounds, RefuseAnAttributeOfTwoValuesOrNone) {
    CmsParts parts = goodParts();
    const Data token = TimestampBuilder().build(derContents(signerOf(parts).signature));
    signerOf(parts).unsignedAttributes = {attributeOf(kTimeStampToken, {token, token})};
    EXPECT_EQ(secureTimestamp(parts.build()), std::nullopt);
    signerOf(parts).unsignedAttributes = {attributeOf(kTimeStampToken, {})};
    EXPECT_EQ(secureTimestamp(parts.build()), std::nullopt);
    signerOf(parts).unsignedAttributes = {attributeOf(kTimeStampToken, {token}),
                                          attributeOf(kTimeStampToken, {token})};
    EXPECT_EQ(secureTimestamp(parts.build()), std::nullopt);
    signerOf(parts).unsignedAttributes = {attributeOf("\x2A\x03", {number(1)}),
                                          attributeOf(kTimeStampToken, {token})};
    EXPECT_TRUE(secureTimestamp(parts.build()));
}

TEST_F(TokenBounds, LeaveAMessageAloneWhoseTokenIsGarbage) {
    CmsParts parts = goodParts();
    signerOf(parts).unsignedAttributes = {
        attributeOf(kTimeStampToken, {derElement(0x30, Data(1000, std::byte{0xFF}))})};
    EXPECT_EQ(secureTimestamp(parts.build()), std::nullopt);
    EXPECT_NO_THROW(codesign::requireDetachedCms(parts.build(), kContent));
}

TEST(TimeOfAToken, IsInUtcToTheSecond) {
    const auto timeOf = [](const std::string& text) {
        return secureTimestamp(CmsBuilder(kContent).timestamp(TimestampBuilder().time(text)).build());
    };
    EXPECT_EQ(timeOf("20261120195500Z"), values::Date{1795204500});
    EXPECT_EQ(timeOf("20240229235959.999999Z"), values::Date{1709251199});
    for (const auto* const wrong :
         {"20261120195500", "20261120195500+0100", "202611201955Z", "2026112019Z", "20261120195500.Z",
          "20261120195500,5Z", "20261120195560Z", "20261120196000Z", "20261120240000Z", "20261131000000Z",
          "20230229000000Z", "20261320195500Z", "20260020195500Z", "2026112019550aZ", "20261120195500Z ",
          "261120195500Z", ""})
        EXPECT_EQ(timeOf(wrong), std::nullopt) << wrong;
}

}  // namespace
}  // namespace pinwell::test
