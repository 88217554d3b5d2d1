#include "trust/der.h"

#include <gtest/gtest.h>

#include <string>

#include "elements.h"

namespace pinwell::trust::der {
namespace {

using foundation::asBytes;
using foundation::Data;
using foundation::toData;
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
        EXPECT_FALSE(readElement(foundation::ByteView(data).first(length))) << length;
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

}  // namespace
}  // namespace pinwell::trust::der
