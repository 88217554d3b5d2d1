// Words that are near to others, and values.
#include "companion/command_line.h"

#include <gtest/gtest.h>

#include <array>

namespace pinwell::test {
namespace {

using companion::nearestWord;
using companion::takeCount;
using companion::takeSeconds;

TEST(NearestWord, IsOneOrTwoEditsAway) {
    static constexpr std::array<std::string_view, 3> kWords{"staple", "validate", "json"};
    EXPECT_EQ(nearestWord("stapel", kWords), "staple");
    EXPECT_EQ(nearestWord("staaple", kWords), "staple");
    EXPECT_EQ(nearestWord("vlidte", kWords), "validate");
    EXPECT_EQ(nearestWord("jsn", kWords), "json");
}

TEST(NearestWord, IsEmptyWhereNoneIsNear) {
    static constexpr std::array<std::string_view, 2> kWords{"staple", "json"};
    EXPECT_EQ(nearestWord("", kWords), "");
    EXPECT_EQ(nearestWord("x", kWords), "");
    EXPECT_EQ(nearestWord("remove", kWords), "");
    EXPECT_EQ(nearestWord(std::string(100'000, 's'), kWords), "");
}

TEST(Count, IsANumberBetweenTwoBounds) {
    std::uint64_t value = 0;
    EXPECT_FALSE(takeCount("1", 1, 10, value));
    EXPECT_FALSE(takeCount("10", 1, 10, value));
    EXPECT_EQ(value, 10U);
    for (const char* text :
         {"", "0", "11", "-1", "+1", " 1", "1 ", "1.0", "0x1", "99999999999999999999999", "one"})
        EXPECT_TRUE(takeCount(text, 1, 10, value)) << text;
    EXPECT_EQ(value, 10U);
}

TEST(Seconds, MayHaveDecimals) {
    std::chrono::duration<double> value{};
    EXPECT_FALSE(takeSeconds("0", value));
    EXPECT_FALSE(takeSeconds("1.5", value));
    EXPECT_EQ(value.count(), 1.5);
    for (const char* text : {"", "-1", "nan", "inf", "1e3", "1s", "999999999999", " 1", "1,5"})
        EXPECT_TRUE(takeSeconds(text, value)) << text;
    EXPECT_EQ(value.count(), 1.5);
}

}  // namespace
}  // namespace pinwell::test
