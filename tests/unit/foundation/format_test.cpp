#include "foundation/format.h"
#include "foundation/url.h"
#include "foundation/value.h"

#include <gtest/gtest.h>

#include <limits>
#include <string>
#include <string_view>

namespace rival {

struct Text {
    operator std::string_view() const { return "ours"; }  // NOLINT: implicit, as the standard strings' is
};

// An argument-dependent lookup of an unqualified call finds this function, as it finds `std::format`.
[[maybe_unused]] inline std::string format(const char*, const Text&) {
    return "the rival's";
}

}  // namespace rival

namespace pinwell::foundation {
namespace {

TEST(Format, IsNotReplacedByAFunctionOfAnArgumentsNamespace) {
    EXPECT_EQ(format("%s", rival::Text()), "ours");
}

TEST(Format, PassesTextThroughAndHalvesPercentSigns) {
    EXPECT_EQ(format(""), "");
    EXPECT_EQ(format("100%% of \n it"), "100% of \n it");
}

TEST(Format, PrintsObjects) {
    EXPECT_EQ(format("%@", nullptr), "(null)");
    EXPECT_EQ(format("%@", std::optional<std::string>()), "(null)");
    EXPECT_EQ(format("%@|%@", URL::fileURLWithPath("/a b"), Value("t")), "file:///a%20b|t");
    EXPECT_EQ(format("%@", toData("ab")), "{length = 2, bytes = 0x6162}");
    EXPECT_EQ(format("%@", Error("D", 1, "t").with("k", Dictionary{{"x", 1}})),
              "Error Domain=D Code=1 \"t\" UserInfo={k={\n    x = 1;\n}}");
    EXPECT_EQ(format("%@", Value(Dictionary{{"a", Dictionary{{"b", 1}}}})),
              "{\n    a = {\n        b = 1;\n    };\n}");
    EXPECT_EQ(format("%@", "a literal"), "a literal");
}

TEST(Format, PrintsUnsignedNumbersAboveTheSignedRangeAsSigned) {
    EXPECT_EQ(format("%d", std::uint32_t{4294967295U}), "-1");
    EXPECT_EQ(format("%d", std::uint32_t{2147483648U}), "-2147483648");
    EXPECT_EQ(format("%i", std::uint16_t{65535}), "65535");
}

TEST(Format, PrintsNegativeNumbersAsUnsignedWordsOfTheirConversion) {
    EXPECT_EQ(format("%u", -1), "4294967295");
    EXPECT_EQ(format("%x", std::int8_t{-1}), "ffffffff");
    EXPECT_EQ(format("%lx", std::int64_t{-1}), "ffffffffffffffff");
}

TEST(Format, PrintsSingleBytes) {
    EXPECT_EQ(format("%02hhx%02hhx", std::uint8_t{0x0A}, std::uint8_t{0xFF}), "0aff");
    EXPECT_EQ(format("%hhd", std::uint8_t{0xFF}), "-1");
}

TEST(Format, PrintsWords) {
    EXPECT_EQ(format("%llu", std::numeric_limits<std::uint64_t>::max()), "18446744073709551615");
    EXPECT_EQ(format("%zu", std::size_t{42}), "42");
    EXPECT_EQ(format("%tu", std::ptrdiff_t{42}), "42");
    EXPECT_EQ(format("%lld", std::numeric_limits<std::int64_t>::min()), "-9223372036854775808");
    EXPECT_EQ(format("%lu %jd", 7UL, std::int64_t{-7}), "7 -7");
}

TEST(Format, ObeysFlagsWidthAndPrecisionOfNumbers) {
    EXPECT_EQ(format("[%5d|%-5d|%05d|%+d|%.3d]", 42, 42, 42, 42, 42), "[   42|42   |00042|+42|042]");
    EXPECT_EQ(format("%#x %X %o", 255, 255, 8), "0xff FF 10");
    EXPECT_EQ(format("%99d", 1), std::string(98, ' ') + "1");
}

TEST(Format, ObeysWidthAndPrecisionOfText) {
    EXPECT_EQ(format("[%4s|%-4s|%.2s]", "ab", "ab", "abc"), "[  ab|ab  |ab]");
    EXPECT_EQ(format("%4s", "abcdef"), "abcdef");
    EXPECT_EQ(format("[%6@]", std::string("ab")), "[    ab]");
}

TEST(Format, EscapesTextAndCharacters) {
    EXPECT_EQ(format("%s", "a\x1B[0m"), "a\\x1b[0m");
    EXPECT_EQ(format("%s", std::string_view("\xFF")), "\\xff");
    EXPECT_EQ(format("%c%c%c", 'a', '\x07', '\0'), "a\\x07\\x00");
    EXPECT_EQ(format("%3c", 'a'), "  a");
}

TEST(Format, DoesNotReadFormatsInsideArguments) {
    EXPECT_EQ(format("%s %@", "%d", std::string("%s%n")), "%d %s%n");
}

TEST(Format, PrintsAMissingText) {
    const char* missing = nullptr;
    char* writable = nullptr;
    EXPECT_EQ(format("%s %@ %s", missing, missing, writable), "(null) (null) (null)");
}

}  // namespace
}  // namespace pinwell::foundation
