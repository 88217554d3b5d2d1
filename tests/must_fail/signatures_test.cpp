// Encodings of one published signature, all of them wrong but a few: RFC 6979, A.2.5, the message "test".
#include <gtest/gtest.h>

#include "base/text.h"
#include "result_table.h"
#include "support/certificate_builder.h"
#include "trust/public_key.h"
#include "unit/trust/published_signatures.h"

namespace pinwell::trust {
namespace {

using base::asBytes;
using base::ByteWriter;

const std::string kR(kTestR);
const std::string kS(kTestS);

Data hex(const std::string& text) {
    return fromHex(text);
}
Data joined(const Data& first, const Data& second) {
    return ByteWriter().bytes(first).bytes(second).data();
}
Data r() {
    return positive(kTestR);
}
Data s() {
    return positive(kTestS);
}
Data good() {
    return sequence(r(), s());
}
Data contents() {
    return joined(r(), s());
}
/// That header in place of the SEQUENCE's own two bytes.
Data headed(const std::string& header) {
    return joined(hex(header), contents());
}
/// The sequence around that r, or that s, of any length below 128 in all.
Data withR(const Data& other) {
    return sequence(other, s());
}
Data withS(const Data& other) {
    return sequence(r(), other);
}
Data retagged(Data data, std::uint8_t tag) {
    data.at(0) = static_cast<std::byte>(tag);
    return data;
}
Data relength(Data data, int by, std::size_t at = 1) {
    data.at(at) = static_cast<std::byte>(std::to_integer<int>(data.at(at)) + by);
    return data;
}

struct SignatureCase {
    std::string name;
    std::string wrong;
    Data field;
    bool accepted = false;
    std::string message = "test";

    friend void PrintTo(const SignatureCase& one, std::ostream* out) { *out << one.wrong; }
};

// The order of the curve above s, s from the order, and so on.
const std::string kROverOrder = "01F1ABB022518351CE71D881567B1EA663AA25F7A46C2AC9BA42E29E73B436A8B8";
const std::string kSOverOrder = "01019F4112742A2B15BD25926B49C649151C0D790E7A98E9D100820D13E0D225D4";
const std::string kRFromOrder = "0E544FDBAE7CAE338E277EA984E1599BCFA7FDB6E204734FA490F712448FA1EA";
const std::string kSFromOrder = "FE60BEEB8BD5D4EC42DA6D94B639B6EA5DC07C4CD3965338E6F1887217F424CE";
const std::string kSampleSFromOrder = "0834E36AD29A83BF2BC9385E491D6099C8FDF9D1ED67AA7EA5F51F93782857A9";
const std::string kOrderAndOne = "FFFFFFFF00000000FFFFFFFFFFFFFFFFBCE6FAADA7179E84F3B9CAC2FC632552";
const std::string kHighest = std::string(64, 'F');

// clang-format off
std::vector<SignatureCase> writtenCases() {
    return {
        // Accepted cases, with the reason.
        {"Test", "nothing: as published, the low one of the two s", good(), true},
        {"Sample", "nothing: as published, and its s is the high one of the two", sequence(positive(kSampleR), positive(kSampleS)), true, "sample"},
        {"TestPadded", "nothing: zeros fill the field", padded(good()), true},
        {"HighS", "s is the high one of the two; X9.62 has no rule on it, and one of the published is", sequence(r(), positive(kSFromOrder)), true},
        {"LowS", "s is the low one of the two; the other is published", sequence(positive(kSampleR), positive(kSampleSFromOrder)), true, "sample"},
        // Values.
        {"AnotherMessage", "the message is another", good(), false, "tesu"},
        {"EmptyMessage", "the message is empty", good(), false, ""},
        {"MessageAndMore", "a byte behind the message", good(), false, "test "},
        {"SampleForTest", "the signature of another message", sequence(positive(kSampleR), positive(kSampleS))},
        {"Swapped", "s stands before r", sequence(s(), r())},
        {"RTwice", "r in the place of s", sequence(r(), r())},
        {"STwice", "s in the place of r", sequence(s(), s())},
        {"RZero", "r is 0", withR(integer("00"))},
        {"SZero", "s is 0", withS(integer("00"))},
        {"BothZero", "r and s are 0", sequence(integer("00"), integer("00"))},
        {"BothOne", "r and s are 1", sequence(integer("01"), integer("01"))},
        {"ROrder", "r is the order", withR(positive(kOrder))},
        {"SOrder", "s is the order", withS(positive(kOrder))},
        {"BothOrder", "r and s are the order", sequence(positive(kOrder), positive(kOrder))},
        {"ROrderAndOne", "r is the order and one", withR(positive(kOrderAndOne))},
        {"SOrderAndOne", "s is the order and one", withS(positive(kOrderAndOne))},
        {"ROverOrder", "r and the order: congruent", withR(integer(kROverOrder))},
        {"SOverOrder", "s and the order: congruent", withS(integer(kSOverOrder))},
        {"RFromOrder", "the order less r", withR(positive(kRFromOrder))},
        {"RHighest", "r is 2^256 - 1", withR(positive(kHighest))},
        {"SHighest", "s is 2^256 - 1", withS(positive(kHighest))},
        {"RLonger", "r times 2^64", withR(positive(kR + std::string(16, '0')))},
        {"SLonger", "s times 2^64", withS(positive(kS + std::string(16, '0')))},
        // Integers.
        {"RNegative", "r lacks the zero that makes it positive", withR(integer(kR))},
        {"RMinusOne", "r is -1", withR(integer("FF"))},
        {"SMinusOne", "s is -1", withS(integer("FF"))},
        {"SNegated", "s is -s", withS(integer("FE60BEEC8BD5D4EB42DA6D94B639B6EAA0D9819F2C7EB4B3F337BDAF1B90FF7D"))},
        {"RZeroTooMany", "a zero too many before r", withR(integer("0000" + kR))},
        {"SZeroTooMany", "a zero too many before s", withS(integer("00" + kS))},
        {"SThreeZeros", "three zeros before s", withS(integer("000000" + kS))},
        {"STwoBytesForOne", "a small s with a zero before it", withS(integer("0001"))},
        {"SZeroTwice", "0 in two bytes", withS(integer("0000"))},
        {"SMinusOneTwice", "-1 in two bytes", withS(integer("FFFF"))},
        {"REmpty", "r has no byte", withR(integer(""))},
        {"SEmpty", "s has no byte", withS(integer(""))},
        {"BothEmpty", "neither has a byte", sequence(integer(""), integer(""))},
        // Lengths.
        {"OuterLengthLong", "the outer length in two bytes", headed("308145")},
        {"OuterLengthLonger", "the outer length in three bytes", headed("30820045")},
        {"OuterLengthOf4", "the outer length in five bytes", headed("308400000045")},
        {"OuterLengthOf8", "the outer length in nine bytes", headed("30880000000000000045")},
        {"OuterLengthIndefinite", "an indefinite outer length and its end", joined(headed("3080"), hex("0000"))},
        {"OuterLengthReserved", "the reserved outer length", headed("30FF")},
        {"OuterLengthEmpty", "an outer length of 0", headed("3000")},
        {"OuterLengthHighest", "an outer length of 2^64 - 1", headed("3088FFFFFFFFFFFFFFFF")},
        {"OuterLengthOneTooHigh", "the outer length reaches into the padding", padded(relength(good(), 1))},
        {"OuterLengthOneTooHighAtTheEnd", "the outer length reaches behind the field", relength(good(), 1)},
        {"OuterLengthOneTooLow", "the outer length leaves the last byte out", relength(good(), -1)},
        {"OuterLengthMissing", "no outer length", headed("30")},
        {"RLengthLong", "r's length in two bytes", withR(hex("02812100" + kR))},
        {"SLengthLong", "s's length in two bytes", withS(hex("028120" + kS))},
        {"SLengthLonger", "s's length in three bytes", withS(hex("02820020" + kS))},
        {"RLengthIndefinite", "r's length is indefinite", withR(hex("028000" + kR + "0000"))},
        {"SLengthIndefinite", "s's length is indefinite", withS(hex("0280" + kS + "0000"))},
        {"RLengthOneTooHigh", "r takes the tag of s", relength(good(), 1, 3)},
        {"RLengthOneTooLow", "r leaves its last byte to s", relength(good(), -1, 3)},
        {"SLengthOneTooHigh", "s reaches behind the sequence", padded(relength(good(), 1, 38))},
        {"SLengthOneTooLow", "s leaves its last byte over", relength(good(), -1, 38)},
        {"SLengthReserved", "the reserved length of s", withS(hex("02FF" + kS))},
        // Bytes around and inside.
        {"ByteBefore", "a zero in front", joined(hex("00"), good())},
        {"PaddedInFront", "the padding stands in front", joined(Data(1), good())},
        {"ByteBehind", "a byte that is not zero behind it", joined(good(), hex("01"))},
        {"ByteBehindPadding", "a byte that is not zero behind a zero", joined(good(), hex("0001"))},
        {"NullBehind", "a NULL behind it", joined(good(), hex("0500"))},
        {"SignatureBehind", "the same signature behind it", joined(good(), good())},
        {"ZeroInside", "a zero inside, behind s", sequence(r(), s(), hex("00"))},
        {"ZerosInside", "two zeros inside, behind s", sequence(r(), s(), hex("0000"))},
        {"NullInside", "a NULL inside, behind s", sequence(r(), s(), hex("0500"))},
        {"ThirdInteger", "a third integer", sequence(r(), s(), integer("01"))},
        {"ThirdIntegerS", "s a second time", sequence(r(), s(), s())},
        {"NullBeforeR", "a NULL before r", sequence(hex("0500"), r(), s())},
        {"NullBetween", "a NULL between r and s", sequence(r(), hex("0500"), s())},
        {"SMissing", "s is missing", sequence(r(), {})},
        {"RMissing", "r is missing", sequence({}, s())},
        {"SequenceEmpty", "an empty sequence", hex("3000")},
        {"SequenceEmptyPadded", "an empty sequence and padding", padded(hex("3000"))},
        {"TagAlone", "the outer tag alone", hex("30")},
        {"NoByte", "no byte", {}},
        {"Zeros", "zeros", Data(kField)},
        {"Ones", "all bits set", Data(kField, std::byte{0xFF})},
        // Tags.
        {"SetTag", "a SET", retagged(good(), 0x31)},
        {"PrimitiveTag", "a SEQUENCE that is not constructed", retagged(good(), 0x10)},
        {"ApplicationTag", "an application's tag 16", retagged(good(), 0x70)},
        {"ContextTag", "a context's tag 16", retagged(good(), 0xB0)},
        {"PrivateTag", "a private tag 16", retagged(good(), 0xF0)},
        {"OctetStringTag", "an OCTET STRING", retagged(good(), 0x04)},
        {"LongTag", "the SEQUENCE's number in the long form", headed("3F1045")},
        {"RBitString", "r is a BIT STRING", withR(retagged(r(), 0x03))},
        {"ROctetString", "r is an OCTET STRING", withR(retagged(r(), 0x04))},
        {"REnumerated", "r is ENUMERATED", withR(retagged(r(), 0x0A))},
        {"RConstructed", "r is a constructed INTEGER", withR(retagged(r(), 0x22))},
        {"RContext", "r has a context's tag 2", withR(retagged(r(), 0x82))},
        {"SBoolean", "s is a BOOLEAN", withS(retagged(s(), 0x01))},
        {"SOctetString", "s is an OCTET STRING", withS(retagged(s(), 0x04))},
        {"SEnumerated", "s is ENUMERATED", withS(retagged(s(), 0x0A))},
        {"SConstructed", "s is a constructed INTEGER", withS(retagged(s(), 0x22))},
        {"SContext", "s has a context's tag 2", withS(retagged(s(), 0x82))},
        {"SLongTag", "the number of s's tag in the long form", withS(hex("1F0220" + kS))},
        // Nesting and other forms.
        {"Nested", "the sequence in a sequence", sequence(good(), {})},
        {"NestedInAnOctetString", "the sequence in an OCTET STRING", element(0x04, good())},
        {"NestedInABitString", "the sequence in a BIT STRING", element(0x03, joined(Data(1), good()))},
        {"IntegersNested", "each integer in a sequence", sequence(sequence(r(), {}), sequence(s(), {}))},
        {"IntegersInIntegers", "each integer in an INTEGER", sequence(element(0x02, r()), element(0x02, s()))},
        {"Bare", "the integers without a sequence", contents()},
        {"Raw", "r and s, 32 bytes each", hex(kR + kS)},
        {"RawPadded", "r and s, 32 bytes each, and padding", padded(hex(kR + kS))},
        {"Hexadecimal", "the signature in hexadecimal digits", base::toData(base::toHex(good()))},
    };
}
// clang-format on

std::string numbered(const char* name, std::size_t number) {
    return std::string(name) + (number < 10 ? "0" : "") + std::to_string(number);
}

std::vector<SignatureCase> signatureCases() {
    std::vector<SignatureCase> cases = writtenCases();
    const Data whole = good();
    for (std::size_t at = 0; at < whole.size(); ++at) {
        const std::string number = std::to_string(at);
        const Data prefix(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(at));
        cases.push_back({numbered("CutAt", at), "ends before byte " + number, prefix});
        cases.push_back({numbered("ZeroFrom", at), "zeros from byte " + number, padded(prefix)});
        Data changed = whole;
        changed.at(at) ^= std::byte{1} << (at % 8);
        cases.push_back({numbered("BitOf", at), "a bit of byte " + number + " is flipped", padded(changed)});
        Data without = whole;
        without.erase(without.begin() + static_cast<std::ptrdiff_t>(at));
        cases.push_back({numbered("Without", at), "byte " + number + " is left out", padded(without)});
        Data with = whole;
        with.insert(with.begin() + static_cast<std::ptrdiff_t>(at), std::byte{0});
        cases.push_back({numbered("ZeroAt", at), "a zero is put in before byte " + number, with});
    }
    return cases;
}

class SignatureTable : public testing::TestWithParam<SignatureCase> {};

TEST_P(SignatureTable, IsVerifiedOrRefused) {
    const SignatureCase& one = GetParam();
    const bool got = verifyEcdsa(sampleKey(), asBytes(one.message), one.field);
    EXPECT_EQ(got, one.accepted) << one.wrong;
    const auto text = [](bool accepted) { return std::string(accepted ? "verifies" : "refused"); };
    test::recordResult({"signatures", one.name, one.wrong, text(one.accepted), text(got), !one.accepted});
}

INSTANTIATE_TEST_SUITE_P(MustFail, SignatureTable, testing::ValuesIn(signatureCases()),
                         [](const auto& tested) { return tested.param.name; });

TEST(PublishedSignature, IsRefusedByEveryOtherKey) {
    for (const auto kind : {test::KeyKind::p256, test::KeyKind::p384, test::KeyKind::rsa2048}) {
        test::CertificateFields fields;
        fields.key = test::SigningKey::cached(kind, "another");
        const auto certificate = X509Certificate::parse(test::issueCertificate(fields, nullptr).der);
        EXPECT_FALSE(verifyEcdsa(*certificate->publicKey(), asBytes("test"), good()));
    }
}

}  // namespace
}  // namespace pinwell::trust
