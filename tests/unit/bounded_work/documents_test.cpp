#include <gtest/gtest.h>

#include "allocation_count.h"
#include "base/text.h"
#include "support/text.h"
#include "values/format.h"
#include "values/json.h"
#include "values/property_list.h"
#include "values/value.h"

namespace pinwell::test {
namespace {

using base::asBytes;
using values::parseJSON;
using values::parsePropertyList;

// A container or value is some hundred bytes, and a list of them grows by doubling.
constexpr std::size_t kBytesPerValue = 1024;

TEST(BoundedWork, JSONNestedAMillionDeepIsLeftAtTheLimit) {
    for (const auto* const opening : {"[", "{\"a\":"}) {
        const std::string document = repeated(opening, 1'000'000);
        const AllocationCount count;
        EXPECT_FALSE(parseJSON(asBytes(document)));
        EXPECT_LE(count.bytes(), values::kMaximumJSONDepth * kBytesPerValue);
    }
}

TEST(BoundedWork, JSONOfMillionsOfValuesIsLeftAtTheLimit) {
    const std::string document = "[" + repeated("0,", 8 * values::kMaximumJSONValues) + "0]";
    const AllocationCount count;
    EXPECT_FALSE(parseJSON(asBytes(document)));
    EXPECT_LE(count.largest(), values::kMaximumJSONValues * 128);
    EXPECT_LE(count.bytes(), values::kMaximumJSONValues * 256);
}

// Each pair of brackets is a value: the costliest for its length.
TEST(BoundedWork, JSONOfTheMostContainersTakesAFixedAmountForEach) {
    const std::string document = "[" + repeated("[0],", values::kMaximumJSONValues / 2 - 2) + "0]";
    const AllocationCount count;
    EXPECT_TRUE(parseJSON(asBytes(document)));
    EXPECT_LE(count.blocks(), values::kMaximumJSONValues * 4);
    EXPECT_LE(count.bytes(), values::kMaximumJSONValues * kBytesPerValue);
}

TEST(BoundedWork, JSONNumberOfAMillionDigitsTakesAFixedAmountForEachDigit) {
    const std::string document = "[" + repeated("9", kMebibyte) + "]";
    const AllocationCount count;
    EXPECT_FALSE(parseJSON(asBytes(document)));
    EXPECT_LE(count.bytes(), 32 * document.size());
}

TEST(BoundedWork, DescriptionGrowsWithItsValueAndNotWithItsDepth) {
    constexpr std::size_t kValues = 100'000;
    constexpr unsigned kDepth = values::kMaximumJSONDepth;
    const std::string document =
        repeated("[", kDepth) + repeated("0,", kValues) + "0" + repeated("]", kDepth);
    const auto value = parseJSON(asBytes(document));
    ASSERT_TRUE(value);
    const AllocationCount count;
    EXPECT_LE(values::describe(*value).size(), 256 * (kValues + kDepth));
    EXPECT_LE(count.bytes(), 4 * 256 * (kValues + kDepth));
}

TEST(BoundedWork, Base64TakesNoMoreThanItsText) {
    const std::string text = repeated("AAAA", 4 * kMebibyte);
    const AllocationCount count;
    EXPECT_TRUE(base::decodeBase64(text));
    EXPECT_LE(count.bytes(), 2 * text.size());
}

TEST(BoundedWork, PropertyListNestedToItsLimitOfLengthIsRefused) {
    const std::string document = "<plist>" + repeated("<array>", values::kMaximumPropertyListSize / 8);
    const AllocationCount count;
    EXPECT_FALSE(parsePropertyList(asBytes(document)));
    EXPECT_LE(count.bytes(), 3 * document.size());
}

TEST(BoundedWork, PropertyListOfTooManyValuesIsLeftAtTheLimit) {
    const std::string document =
        "<plist><array>" + repeated("<true/>", values::kMaximumPropertyListValues + 1) + "</array></plist>";
    const AllocationCount count;
    EXPECT_FALSE(parsePropertyList(asBytes(document)));
    EXPECT_LE(count.largest(), values::kMaximumPropertyListValues * 64);
    EXPECT_LE(count.bytes(), values::kMaximumPropertyListValues * 128);
}

TEST(BoundedWork, PropertyListWithEntitiesThatUnfoldIsRefused) {
    std::string document = "<!DOCTYPE plist [<!ENTITY a0 'aaaaaaaaaa'>";
    for (int i = 1; i < 30; ++i) {
        const std::string before = "&a" + std::to_string(i - 1) + ";";
        document += "<!ENTITY a" + std::to_string(i) + " '" + repeated(before, 10) + "'>";
    }
    document += "]><plist><string>&a29;</string></plist>";
    const AllocationCount count;
    EXPECT_FALSE(parsePropertyList(asBytes(document)));
    EXPECT_LE(count.bytes(), kMebibyte / 2) << "the piece that the parser takes at a time";
}

// Forty arrays, each with two references to the next: 2^40 values in some hundred bytes.
TEST(BoundedWork, BinaryPropertyListThatUnfoldsIsRefused) {
    constexpr char kObjects = 40;
    std::string document = "bplist00";
    std::string offsets;
    for (char i = 0; i < kObjects; ++i) {
        offsets += static_cast<char>(document.size());
        document += '\xA2';
        document += static_cast<char>(i + 1);
        document += static_cast<char>(i + 1);
    }
    offsets += static_cast<char>(document.size());
    document += '\x09';
    const char table = static_cast<char>(document.size());
    document += offsets + std::string(6, '\0') + "\x01\x01" + std::string(7, '\0');
    document += static_cast<char>(kObjects + 1);
    document += std::string(8, '\0') + std::string(7, '\0') + table;

    const AllocationCount count;
    EXPECT_FALSE(parsePropertyList(asBytes(document)));
    EXPECT_LE(count.bytes(), kMebibyte);
}

}  // namespace
}  // namespace pinwell::test
