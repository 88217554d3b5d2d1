// Words that are near to others, and values.
#include "companion/command_line.h"

#include <gtest/gtest.h>

#include <array>

namespace pinwell::test {
namespace {

using companion::nearestWord;
using companion::readCount;
using companion::readSeconds;

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
    EXPECT_EQ(*readCount("1", 1, 10), 1U);
    EXPECT_EQ(*readCount("10", 1, 10), 10U);
    for (const char* text :
         {"", "0", "11", "-1", "+1", " 1", "1 ", "1.0", "0x1", "99999999999999999999999", "one"})
        EXPECT_FALSE(readCount(text, 1, 10)) << text;
}

TEST(Option, LeavesItsValueIfTheTextIsWrong) {
    unsigned count = 7;
    const auto jobs = companion::countOption("jobs", 'j', "N", "", 1, 10, count);
    EXPECT_FALSE(jobs.take("11"));
    EXPECT_EQ(count, 7U);
    EXPECT_TRUE(jobs.take("10"));
    EXPECT_EQ(count, 10U);

    std::optional<companion::Seconds> limit;
    const auto timeout = companion::secondsOption("timeout", "", limit);
    EXPECT_FALSE(timeout.take("soon"));
    EXPECT_FALSE(limit);
    EXPECT_TRUE(timeout.take("1.5"));
    EXPECT_EQ(limit, companion::Seconds(1.5));
}

TEST(Seconds, MayHaveDecimals) {
    EXPECT_EQ(readSeconds("0")->count(), 0);
    EXPECT_EQ(readSeconds("1.5")->count(), 1.5);
    for (const char* text : {"", "-1", "nan", "inf", "1e3", "1s", "999999999999", " 1", "1,5"})
        EXPECT_FALSE(readSeconds(text)) << text;
}

}  // namespace
}  // namespace pinwell::test
