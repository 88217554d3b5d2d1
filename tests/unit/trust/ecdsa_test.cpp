#include "trust/public_key.h"

#include <gtest/gtest.h>

#include "base/byte_io.h"
#include "published_signatures.h"
#include "support/certificate_builder.h"
#include "trust/certificate.h"

namespace pinwell::trust {
namespace {

using base::asBytes;
using base::ByteWriter;
using test::KeyKind;
using test::SigningKey;

X509PublicKey publicKey(KeyKind kind) {
    test::CertificateFields fields;
    fields.key = SigningKey::cached(kind, "signer");
    return X509PublicKey(*X509Certificate::parse(test::issueCertificate(fields, nullptr).der)->publicKey());
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

TEST(TicketSignature, RefusesANonZeroByteAfterIt) {
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

TEST(TicketSignature, VerifiesOnOtherCurves) {
    const Data signature = SigningKey::cached(KeyKind::p384, "signer").sign(asBytes("message"));
    EXPECT_TRUE(verifyEcdsa(publicKey(KeyKind::p384), asBytes("message"), signature));
}

TEST(TicketSignature, NeverVerifiesWithAnRsaKey) {
    const Data signature = SigningKey::cached(KeyKind::rsa2048, "signer").sign(asBytes("message"));
    EXPECT_FALSE(verifyEcdsa(publicKey(KeyKind::rsa2048), asBytes("message"), signature));
}

// Encodings of the second published signature, over "test": a description, and whether it verifies. Only
// strict DER does; each unusual accepted form has its reason.

Data r() {
    return positive(kTestR);
}
Data s() {
    return positive(kTestS);
}
Data genuine() {
    return sequence(r(), s());
}
Data withByte(Data bytes, std::size_t index, unsigned value) {
    bytes.at(index) = static_cast<std::byte>(value);
    return bytes;
}
/// The SEQUENCE's contents after other bytes for tag and length.
Data headed(std::string_view head, std::string_view tail = "") {
    return ByteWriter().bytes(fromHex(head)).bytes(r()).bytes(s()).bytes(fromHex(tail)).data();
}
/// The genuine r with other bytes for tag and length, in a SEQUENCE that fits it.
Data headedR(std::string_view head, std::string_view tail = "") {
    return sequence(ByteWriter()
                        .bytes(fromHex(head))
                        .bytes(fromHex("00"))
                        .bytes(fromHex(kTestR))
                        .bytes(fromHex(tail))
                        .data(),
                    s());
}
std::string hex(std::string_view before, std::string_view number) {
    return std::string(before) + std::string(number);
}

// Sizes: r has 33 bytes, s 32, their elements 35 and 34, the contents 69 (0x45).
constexpr std::size_t kIntegerR = 2;
constexpr std::size_t kIntegerS = 37;
constexpr std::string_view kOrderLessOne = "FFFFFFFF00000000FFFFFFFFFFFFFFFFBCE6FAADA7179E84F3B9CAC2FC632550";
constexpr std::string_view kComplementOfS =
    "FE60BEEB8BD5D4EC42DA6D94B639B6EA5DC07C4CD3965338E6F1887217F424CE";
constexpr std::string_view kNegatedS = "FE60BEEC8BD5D4EB42DA6D94B639B6EAA0D9819F2C7EB4B3F337BDAF1B90FF7D";
constexpr std::string_view kRPlusOrder = "01F1ABB022518351CE71D881567B1EA663AA25F7A46C2AC9BA42E29E73B436A8B8";
constexpr std::string_view kSPlusOrder = "01019F4112742A2B15BD25926B49C649151C0D790E7A98E9D100820D13E0D225D4";

struct Encoding {
    const char* name;
    const char* what;
    Data (*make)();
    bool verifies = false;
};

void PrintTo(const Encoding& encoding, std::ostream* out) {
    *out << encoding.what << " -> " << (encoding.verifies ? "verifies" : "refused");
}

class SignatureEncoding : public testing::TestWithParam<Encoding> {};

TEST_P(SignatureEncoding, IsJudgedAccordingToTheTable) {
    EXPECT_EQ(verifyEcdsa(sampleKey(), asBytes("test"), GetParam().make()), GetParam().verifies);
}

// clang-format off
const Encoding kEncodings[] = {
    {"Genuine", "the published signature", genuine, true},
    {"ZerosBehind", "zeros up to the end of the field, which is how a field is filled", [] { return padded(genuine()); }, true},
    {"HeadedByHand", "the published signature with its head written by hand, as rows below do", [] { return headed("3045"); }, true},
    {"RHeadedByHand", "the same for the head of r", [] { return headedR("0221"); }, true},
    {"ComplementOfS", "order - s: X9.62 lets both stand, and no rule here tells tickets apart by their signature",
     [] { return sequence(r(), positive(kComplementOfS)); }, true},

    {"Empty", "no byte at all", [] { return Data{}; }},
    {"ZerosOnly", "a field of zeros", [] { return Data(kField); }},
    {"EmptySequence", "a SEQUENCE of nothing", [] { return fromHex("3000"); }},
    {"RAlone", "s is missing", [] { return sequence(r(), {}); }},
    {"ThreeIntegers", "a third INTEGER", [] { return sequence(r(), s(), integer("01")); }},
    {"NullInside", "a NULL behind s, inside", [] { return sequence(r(), s(), fromHex("0500")); }},
    {"ZerosInside", "zeros behind s, inside", [] { return sequence(r(), s(), fromHex("0000")); }},
    {"ByteInside", "one byte behind s, inside", [] { return sequence(r(), s(), fromHex("01")); }},
    {"Swapped", "s before r", [] { return sequence(s(), r()); }},
    {"RTwice", "r in the place of s", [] { return sequence(r(), r()); }},
    {"STwice", "s in the place of r", [] { return sequence(s(), s()); }},
    {"Nested", "a SEQUENCE in a SEQUENCE", [] { return sequence(genuine(), {}); }},
    {"NestedIntegers", "each INTEGER in a SEQUENCE of its own", [] { return sequence(element(0x30, r()), element(0x30, s())); }},
    {"Raw", "r and s side by side, without DER", [] { return fromHex(hex(kTestR, kTestS)); }},
    {"InBitString", "the whole in a BIT STRING, as certificates have it", [] { return element(0x03, ByteWriter().u8(0).bytes(genuine()).data()); }},
    {"InOctetString", "the whole in an OCTET STRING", [] { return element(0x04, genuine()); }},

    {"OuterTagSet", "a SET instead of the SEQUENCE", [] { return withByte(genuine(), 0, 0x31); }},
    {"OuterTagPrimitive", "the SEQUENCE as a primitive element", [] { return withByte(genuine(), 0, 0x10); }},
    {"OuterTagContext", "a context-specific tag outside", [] { return withByte(genuine(), 0, 0xA0); }},
    {"OuterTagApplication", "an application tag outside", [] { return withByte(genuine(), 0, 0x70); }},
    {"OuterTagLong", "tag number 16 in the long form", [] { return headed("3F1045"); }},
    {"RTagEnumerated", "r as an ENUMERATED", [] { return withByte(genuine(), kIntegerR, 0x0A); }},
    {"RTagOctets", "r as an OCTET STRING", [] { return withByte(genuine(), kIntegerR, 0x04); }},
    {"RTagConstructed", "r as a constructed INTEGER", [] { return withByte(genuine(), kIntegerR, 0x22); }},
    {"RTagContext", "r under a context-specific tag", [] { return withByte(genuine(), kIntegerR, 0x82); }},
    {"RTagLong", "r with tag number 2 in the long form", [] { return headedR("1F0221"); }},
    {"STagEnumerated", "s as an ENUMERATED", [] { return withByte(genuine(), kIntegerS, 0x0A); }},
    {"STagOctets", "s as an OCTET STRING", [] { return withByte(genuine(), kIntegerS, 0x04); }},
    {"STagConstructed", "s as a constructed INTEGER", [] { return withByte(genuine(), kIntegerS, 0x22); }},
    {"STagContext", "s under a context-specific tag", [] { return withByte(genuine(), kIntegerS, 0x82); }},

    {"OuterLengthOneByteForm", "the outer length in 0x81 form", [] { return headed("308145"); }},
    {"OuterLengthTwoByteForm", "the outer length in 0x82 form", [] { return headed("30820045"); }},
    {"OuterLengthEightByteForm", "the outer length in eight bytes", [] { return headed("30880000000000000045"); }},
    {"OuterLengthReserved", "the reserved length byte 0xFF", [] { return headed("30FF"); }},
    {"OuterLengthHuge", "an outer length of 2^64 - 1", [] { return headed("3088FFFFFFFFFFFFFFFF"); }},
    {"OuterLengthIndefinite", "the indefinite form outside", [] { return headed("3080", "0000"); }},
    {"OuterLengthZero", "an outer length of zero", [] { return withByte(genuine(), 1, 0); }},
    {"OuterLengthShort", "an outer length one too small", [] { return withByte(genuine(), 1, 0x44); }},
    {"OuterLengthShortInField", "an outer length one too small, in a filled field", [] { return padded(withByte(genuine(), 1, 0x44)); }},
    {"OuterLengthLong", "an outer length one too large", [] { return withByte(genuine(), 1, 0x46); }},
    {"OuterLengthOverPadding", "an outer length that takes a zero of the filling in", [] { return padded(withByte(genuine(), 1, 0x46)); }},
    {"RLengthLongForm", "the length of r in 0x81 form", [] { return headedR("028121"); }},
    {"RLengthTwoByteForm", "the length of r in 0x82 form", [] { return headedR("02820021"); }},
    {"RLengthIndefinite", "the indefinite form for r", [] { return headedR("0280", "0000"); }},
    {"RLengthZero", "a length of zero for r", [] { return withByte(genuine(), kIntegerR + 1, 0); }},
    {"RLengthShort", "the length of r one too small", [] { return withByte(genuine(), kIntegerR + 1, 0x20); }},
    {"RLengthLong", "the length of r one too large", [] { return withByte(genuine(), kIntegerR + 1, 0x22); }},
    {"RLengthTakesAll", "r reaches to the end of the SEQUENCE", [] { return withByte(genuine(), kIntegerR + 1, 0x43); }},
    {"RLengthBeyond", "r reaches past the end of the SEQUENCE", [] { return padded(withByte(genuine(), kIntegerR + 1, 0x44)); }},
    {"SLengthZero", "a length of zero for s", [] { return withByte(genuine(), kIntegerS + 1, 0); }},
    {"SLengthShort", "the length of s one too small", [] { return withByte(genuine(), kIntegerS + 1, 0x1F); }},
    {"SLengthLong", "the length of s one too large", [] { return withByte(genuine(), kIntegerS + 1, 0x21); }},
    {"SLengthOverPadding", "s takes a zero of the filling in", [] { return padded(withByte(genuine(), kIntegerS + 1, 0x21)); }},
    {"SLengthLongForm", "the length of s in 0x81 form", [] { return sequence(r(), fromHex(hex("028120", kTestS))); }},

    {"RNegative", "r without its leading zero: negative", [] { return sequence(integer(kTestR), s()); }},
    {"SNegative", "-s", [] { return sequence(r(), integer(hex("", kNegatedS))); }},
    {"SMinusOne", "s is -1", [] { return sequence(r(), integer("FF")); }},
    {"RNotShortest", "two leading zeros before r", [] { return sequence(integer(hex("0000", kTestR)), s()); }},
    {"SNotShortest", "a leading zero before s that it does not need", [] { return sequence(r(), integer(hex("00", kTestS))); }},
    {"SNegativeNotShortest", "-s behind a byte 0xFF", [] { return sequence(r(), integer(hex("FF", kNegatedS))); }},
    {"RZero", "r is zero", [] { return sequence(integer("00"), s()); }},
    {"SZero", "s is zero", [] { return sequence(r(), integer("00")); }},
    {"BothZero", "r and s are zero", [] { return sequence(integer("00"), integer("00")); }},
    {"RZeroInTwoBytes", "r is zero, in two bytes", [] { return sequence(integer("0000"), s()); }},
    {"BothOne", "r and s are one", [] { return sequence(integer("01"), integer("01")); }},
    {"REmpty", "r has no contents", [] { return sequence(integer(""), s()); }},
    {"SEmpty", "s has no contents", [] { return sequence(r(), integer("")); }},
    {"ROrder", "r is the order", [] { return sequence(positive(kOrder), s()); }},
    {"SOrder", "s is the order", [] { return sequence(r(), positive(kOrder)); }},
    {"BothOrder", "r and s are the order", [] { return sequence(positive(kOrder), positive(kOrder)); }},
    {"ROrderLessOne", "r is the order less one, in range but another", [] { return sequence(positive(kOrderLessOne), s()); }},
    {"RPlusOrder", "r plus the order: congruent, and yet not a signature", [] { return sequence(integer(kRPlusOrder), s()); }},
    {"SPlusOrder", "s plus the order: congruent, and yet not a signature", [] { return sequence(r(), integer(kSPlusOrder)); }},
    {"RComplement", "s in its complement and r changed by one", [] { return withByte(sequence(r(), positive(kComplementOfS)), 36, 0x66); }},

    {"OneBehind", "one byte 1 behind the SEQUENCE", [] { return withByte(padded(genuine()), kField - 1, 1); }},
    {"SignatureTwice", "the same SEQUENCE again behind the first", [] { return ByteWriter().bytes(genuine()).bytes(genuine()).data(); }},
    {"ZeroBefore", "a zero before the SEQUENCE", [] { return ByteWriter().u8(0).bytes(genuine()).data(); }},
};
// clang-format on

INSTANTIATE_TEST_SUITE_P(TicketSignature, SignatureEncoding, testing::ValuesIn(kEncodings),
                         [](const auto& tested) { return std::string(tested.param.name); });

TEST(TicketSignature, RefusesToBeCutShortAnywhere) {
    const Data whole = genuine();
    for (std::size_t size = 0; size < whole.size(); ++size) {
        const Data cut(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(size));
        EXPECT_FALSE(verifyEcdsa(sampleKey(), asBytes("test"), cut)) << size << " bytes";
        EXPECT_FALSE(verifyEcdsa(sampleKey(), asBytes("test"), padded(cut))) << size << " bytes, filled up";
    }
}

TEST(TicketSignature, RefusesAnyFlippedBit) {
    const Data field = padded(genuine());
    for (std::size_t bit = 0; bit < field.size() * 8; ++bit) {
        Data flipped = field;
        flipped[bit / 8] ^= std::byte{1} << (bit % 8);
        EXPECT_FALSE(verifyEcdsa(sampleKey(), asBytes("test"), flipped)) << "bit " << bit;
    }
}

}  // namespace
}  // namespace pinwell::trust
