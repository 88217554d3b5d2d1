#include "trust/der.h"

#include <gtest/gtest.h>

#include <string>

#include "elements.h"

namespace pinwell::trust::der {
namespace {

using base::asBytes;
using base::Data;
using base::toData;
using namespace std::string_literals;

std::optional<Element> element(const Data& data) {
    return readElement(data);
}

TEST(DerTag, ReadsClassConstructedBitAndNumber) {
    const auto tag = readTag(bytes({0xA3}));
    ASSERT_TRUE(tag);
    EXPECT_EQ(tag->first, (Tag{TagClass::contextSpecific, true, 3}));
    EXPECT_EQ(tag->second, 1U);
}

TEST(DerTag, KnowsASequence) {
    EXPECT_EQ(readTag(bytes({0x30, 0x00}))->first, kConstructedSequence);
}

TEST(DerTag, ReadsNumbersInBase128) {
    EXPECT_EQ(readTag(bytes({0x1F, 0x1F}))->first.number, 31U);
    EXPECT_EQ(readTag(bytes({0x1F, 0x81, 0x00}))->first.number, 128U);
    EXPECT_EQ(readTag(bytes({0x1F, 0x81, 0x00}))->second, 3U);
    EXPECT_EQ(readTag(bytes({0x1F, 0x8F, 0xFF, 0xFF, 0xFF, 0x7F}))->first.number, 0xFFFFFFFFU);
}

TEST(DerTag, RefusesNumbersThatDoNotFit32Bits) {
    EXPECT_FALSE(readTag(bytes({0x1F, 0x90, 0x80, 0x80, 0x80, 0x00})));
    EXPECT_FALSE(readTag(bytes({0x1F, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0x7F})));
}

TEST(DerTag, RefusesNumbersNotInTheirShortestForm) {
    EXPECT_FALSE(readTag(bytes({0x1F, 0x80, 0x1F})));  // a leading zero digit
    EXPECT_FALSE(readTag(bytes({0x1F, 0x1E})));        // fits the first byte
}

TEST(DerTag, RefusesACutTag) {
    EXPECT_FALSE(readTag({}));
    EXPECT_FALSE(readTag(bytes({0x1F})));
    EXPECT_FALSE(readTag(bytes({0x1F, 0x81})));
}

TEST(DerElement, ReadsAShortLengthAndLeavesTheRest) {
    const Data data = bytes({0x04, 0x02, 0xAA, 0xBB, 0xCC});
    const auto found = element(data);
    ASSERT_TRUE(found);
    EXPECT_EQ(found->whole.size(), 4U);
    EXPECT_EQ(toData(found->contents), bytes({0xAA, 0xBB}));
}

TEST(DerElement, ReadsLongLengths) {
    Data data = bytes({0x04, 0x81, 0x80});
    data.resize(3 + 128);
    EXPECT_EQ(element(data)->contents.size(), 128U);
    data = bytes({0x04, 0x82, 0x01, 0x00});
    data.resize(4 + 256);
    EXPECT_EQ(element(data)->contents.size(), 256U);
}

TEST(DerElement, ReadsAnEmptyElement) {
    EXPECT_TRUE(element(bytes({0x05, 0x00}))->contents.empty());
}

TEST(DerElement, RefusesAnElementCutAtEveryByte) {
    Data data = bytes({0x1F, 0x1F, 0x81, 0x80});
    data.resize(4 + 128);
    ASSERT_TRUE(element(data));
    for (std::size_t length = 0; length < data.size(); ++length) {
        EXPECT_FALSE(readElement(base::ByteView(data).first(length))) << length;
    }
}

TEST(DerElement, RefusesAnIndefiniteLength) {
    EXPECT_FALSE(element(bytes({0x30, 0x80, 0x00, 0x00})));
}

TEST(DerElement, RefusesLengthsNotInTheirShortestForm) {
    EXPECT_FALSE(element(bytes({0x04, 0x81, 0x01, 0xAA})));
    EXPECT_FALSE(element(bytes({0x04, 0x82, 0x00, 0x01, 0xAA})));
    Data data = bytes({0x04, 0x82, 0x00, 0x80});
    data.resize(4 + 128);
    EXPECT_FALSE(element(data));
}

TEST(DerElement, RefusesTheReservedLength) {
    EXPECT_FALSE(element(bytes({0x04, 0xFF})));
}

TEST(DerElement, RefusesLengthsFarBeyondTheInput) {
    EXPECT_FALSE(element(bytes({0x04, 0x84, 0xFF, 0xFF, 0xFF, 0xFF, 0x00})));
    EXPECT_FALSE(element(bytes({0x04, 0x88, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0x00})));
    EXPECT_FALSE(element(bytes({0x04, 0x89, 0x01, 0, 0, 0, 0, 0, 0, 0, 0, 0x00})));
}

TEST(DerNesting, AcceptsElementsWithinElements) {
    EXPECT_TRUE(isNestedDefinite(bytes({0x30, 0x04, 0x30, 0x02, 0x05, 0x00})));
}

TEST(DerNesting, RefusesAnIndefiniteLengthAnywhereInside) {
    EXPECT_FALSE(isNestedDefinite(bytes({0x30, 0x04, 0x30, 0x80, 0x00, 0x00})));
}

TEST(DerNesting, RefusesBytesThatAreNoElement) {
    EXPECT_FALSE(isNestedDefinite(bytes({0x30, 0x01, 0x05})));
}

TEST(DerNesting, EndsAtItsLimit) {
    EXPECT_TRUE(isNestedDefinite(bytes({0x30, 0x02, 0x30, 0x00}), 2));
    EXPECT_FALSE(isNestedDefinite(bytes({0x30, 0x02, 0x30, 0x00}), 1));
}

using base::ByteView;
using values::Date;

bool isInteger(const Data& contents) {
    try {
        checkInteger(contents);
        return true;
    } catch (const Malformed&) {
        return false;
    }
}

TEST(DerInteger, IsInTheFewestBytes) {
    EXPECT_TRUE(isInteger(bytes({0})));
    EXPECT_TRUE(isInteger(bytes({0x7F})));
    EXPECT_TRUE(isInteger(bytes({0x00, 0x80})));
    EXPECT_TRUE(isInteger(bytes({0xFF})));
    EXPECT_TRUE(isInteger(bytes({0xFF, 0x7F})));
    EXPECT_FALSE(isInteger({}));
    EXPECT_FALSE(isInteger(bytes({0x00, 0x7F})));
    EXPECT_FALSE(isInteger(bytes({0x00, 0x00})));
    EXPECT_FALSE(isInteger(bytes({0xFF, 0x80})));
    EXPECT_FALSE(isInteger(bytes({0xFF, 0xFF})));
}

TEST(DerInteger, IsANumberWithoutItsLeadingZero) {
    const Data positive = bytes({0x00, 0x80, 0x01});
    const ByteView number = naturalNumber(positive);
    EXPECT_EQ(Data(number.begin(), number.end()), bytes({0x80, 0x01}));
    EXPECT_TRUE(naturalNumber(bytes({0})).empty());
    EXPECT_THROW(naturalNumber(bytes({0xFF})), Malformed);
}

TEST(DerBoolean, IsZeroOrAllOnes) {
    const auto read = [](const Data& element) { return Cursor(element).boolean(); };
    EXPECT_TRUE(read(bytes({1, 1, 0xFF})));
    EXPECT_FALSE(read(bytes({1, 1, 0})));
    EXPECT_THROW(read(bytes({1, 1, 1})), Malformed);
    EXPECT_THROW(read(bytes({1, 0})), Malformed);
    EXPECT_THROW(read(bytes({1, 2, 0xFF, 0xFF})), Malformed);
}

TEST(DerBitString, CountsUnusedBitsThatAreZero) {
    EXPECT_EQ(bitString(bytes({0})).size(), 0U);
    EXPECT_EQ(bitString(bytes({3, 0xF8})).size(), 1U);
    EXPECT_THROW(bitString({}), Malformed);
    EXPECT_THROW(bitString(bytes({1})), Malformed) << "of no byte";
    EXPECT_THROW(bitString(bytes({8, 0})), Malformed) << "of more than a byte";
    EXPECT_THROW(bitString(bytes({3, 0xFC})), Malformed) << "an unused bit is set";
}

TEST(DerBitString, FillsWholeBytesIfBytesAreRequired) {
    EXPECT_EQ(wholeBytes(bytes({0, 0xFC})).size(), 1U);
    EXPECT_THROW(wholeBytes(bytes({3, 0xF8})), Malformed);
    EXPECT_THROW(wholeBytes({}), Malformed);
}

TEST(DerOid, HasADottedForm) {
    EXPECT_EQ(dottedOid(bytes({0x2A, 0x86, 0x48, 0xCE, 0x3D, 0x03, 0x01, 0x07})), "1.2.840.10045.3.1.7");
    EXPECT_EQ(dottedOid(bytes({0x55, 0x1D, 0x13})), "2.5.29.19");
    EXPECT_EQ(dottedOid(bytes({0x00})), "0.0");
    EXPECT_EQ(dottedOid(bytes({0x27})), "0.39");
    EXPECT_EQ(dottedOid(bytes({0x28})), "1.0");
    EXPECT_EQ(dottedOid(bytes({0x4F})), "1.39");
    EXPECT_EQ(dottedOid(bytes({0x50})), "2.0");
    EXPECT_EQ(dottedOid(bytes({0x88, 0x37, 0x03})), "2.999.3");
}

TEST(DerOid, HasArcsOfAnySize) {
    // 2.25 and a number of 128 bits (X.667).
    EXPECT_EQ(dottedOid(bytes({0x69, 0x83, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF,
                               0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0x7F})),
              "2.25.340282366920938463463374607431768211455");
    // The first number less 80: a borrow through every limb.
    EXPECT_EQ(dottedOid(bytes({0x83, 0xDC, 0xEB, 0x94, 0x00})), "2.999999920");
}

TEST(DerOid, IsRefusedWhenItIsNotInTheShortestForm) {
    EXPECT_THROW(dottedOid({}), Malformed);
    EXPECT_THROW(dottedOid(bytes({0x2A, 0x80, 0x01})), Malformed) << "a zero digit in front";
    EXPECT_THROW(dottedOid(bytes({0x80, 0x01})), Malformed);
    EXPECT_THROW(dottedOid(bytes({0x2A, 0x86})), Malformed) << "ends inside an arc";
}

TEST(DerOid, HasALimitOnItsSize) {
    EXPECT_NO_THROW(dottedOid(Data(kMaximumOidSize, std::byte{1})));
    EXPECT_THROW(dottedOid(Data(kMaximumOidSize + 1, std::byte{1})), Malformed);
}

std::optional<Date> utc(std::string_view text) {
    const Data element = derElement(0x17, asBytes(text));
    try {
        return readTime(*readElement(element));
    } catch (const Malformed&) {
        return std::nullopt;
    }
}

std::optional<Date> generalized(std::string_view text) {
    const Data element = derElement(0x18, asBytes(text));
    try {
        return readTime(*readElement(element));
    } catch (const Malformed&) {
        return std::nullopt;
    }
}

TEST(DerTime, OfTwoDigitsBelongsTo1950To2049) {
    EXPECT_EQ(utc("700101000000Z"), Date{0});
    EXPECT_EQ(utc("500101000000Z"), Date{-631152000});
    EXPECT_EQ(utc("491231235959Z"), Date{2524607999});
    EXPECT_EQ(utc("261120195500Z"), Date{1795204500});
}

TEST(DerTime, OfFourDigitsIsAnyYear) {
    EXPECT_EQ(generalized("19700101000000Z"), Date{0});
    EXPECT_EQ(generalized("99991231235959Z"), Date{253402300799});
    EXPECT_EQ(generalized("00000101000000Z"), Date{-62167219200});
    EXPECT_EQ(generalized("20240229000000Z"), Date{1709164800});
}

TEST(DerTime, IsRefusedInAnyOtherForm) {
    for (const char* text : {"", "700101000000", "7001010000Z", "700101000000+0000", "700101000000-0100",
                             "700101000000ZZ", "700101000000z", "70010100000aZ", " 00101000000Z",
                             "+00101000000Z", "19700101000000Z", "700101000000.5Z"})
        EXPECT_EQ(utc(text), std::nullopt) << text;
    for (const char* text : {"", "19700101000000", "197001010000Z", "1970010100Z", "19700101000000.5Z",
                             "19700101000000+0000", "700101000000Z", "1970010100000000Z"})
        EXPECT_EQ(generalized(text), std::nullopt) << text;
    const Data withNul = derElement(0x17, asBytes(std::string_view("70010100000\0Z", 13)));
    EXPECT_THROW(readTime(*readElement(withNul)), Malformed);
    const Data otherType = derElement(0x0C, asBytes("700101000000Z"));
    EXPECT_THROW(readTime(*readElement(otherType)), Malformed);
}

TEST(DerTime, IsRefusedWhereThereIsNoSuchDate) {
    for (const char* text :
         {"700001000000Z", "701301000000Z", "700100000000Z", "700132000000Z", "700229000000Z",
          "700431000000Z", "700101240000Z", "700101006000Z", "700101000060Z"})
        EXPECT_EQ(utc(text), std::nullopt) << text;
    EXPECT_EQ(generalized("19000229000000Z"), std::nullopt);
    EXPECT_NE(generalized("20000229000000Z"), std::nullopt);
}

TEST(DerCursor, TakesElementsOneAfterTheOther) {
    const Data all = bytes({2, 1, 7, 5, 0, 0x30, 2, 5, 0});
    Cursor cursor(all);
    EXPECT_EQ(cursor.takeIf(kNull), std::nullopt);
    EXPECT_EQ(cursor.naturalNumber().size(), 1U);
    EXPECT_THROW(cursor.take(kBoolean), Malformed);
    cursor.take(kNull);
    EXPECT_THROW(cursor.expectEnd(), Malformed);
    Cursor inner = cursor.enter(kConstructedSequence);
    inner.take(kNull);
    inner.expectEnd();
    cursor.expectEnd();
    EXPECT_THROW(cursor.any(), Malformed);
    EXPECT_EQ(cursor.takeIf(kNull), std::nullopt);
}

}  // namespace
}  // namespace pinwell::trust::der
