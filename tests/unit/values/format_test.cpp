#include "values/format.h"

#include <gtest/gtest.h>

#include <limits>
#include <string>
#include <string_view>

#include "base/bytes.h"
#include "values/date.h"
#include "values/url.h"
#include "values/value.h"

namespace rival {

struct Text {
    operator std::string_view() const { return "ours"; }  // NOLINT: implicit, as the standard strings' is
};

// An argument-dependent lookup of an unqualified call finds this function, as it finds `std::format`.
[[maybe_unused]] inline std::string format(const char*, const Text&) {
    return "the rival's";
}

}  // namespace rival

namespace pinwell::values {
namespace {

using base::Data;
using base::Error;
using base::toData;

template <class T>
std::string described(const T& object) {
    return Description<T>::of(object);
}

TEST(Description, OfNilIsTheSameForEveryKind) {
    EXPECT_EQ(described(nullptr), "(null)");
    EXPECT_EQ(described(Value()), "(null)");
    EXPECT_EQ(described(std::optional<Error>()), "(null)");
    EXPECT_EQ(described(std::shared_ptr<const Error>()), "(null)");
    EXPECT_EQ(described<const char*>(nullptr), "(null)");
}

TEST(Description, OfAJSONNull) {
    EXPECT_EQ(described(Value(Value::Null{})), "<null>");
}

TEST(Description, OfTextByItselfIsTheText) {
    EXPECT_EQ(described(Value("two words")), "two words");
    EXPECT_EQ(described(std::string("a\x07")), "a\\x07");
}

TEST(Description, OfNumbers) {
    EXPECT_EQ(described(Value(true)), "1");
    EXPECT_EQ(described(Value(false)), "0");
    EXPECT_EQ(described(Value(-5)), "-5");
    EXPECT_EQ(described(Value(std::uint64_t{18446744073709551615U})), "18446744073709551615");
    EXPECT_EQ(described(Value(1.5)), "1.5");
    EXPECT_EQ(described(Value(1e30)), "1e+30");
}

TEST(Description, OfBytesShowsLongOnesByTheirEnds) {
    EXPECT_EQ(described(Data()), "{length = 0, bytes = 0x}");
    EXPECT_EQ(described(toData("abcde")), "{length = 5, bytes = 0x61626364 65}");
    EXPECT_EQ(described(Data(24)),
              "{length = 24, bytes = 0x00000000 00000000 00000000 00000000 00000000 00000000}");
    Data longer(25);
    longer.back() = std::byte{0xAB};
    EXPECT_EQ(described(longer), "{length = 25, bytes = 0x00000000 00000000 00000000 00000000 ... 000000ab}");
}

TEST(Description, OfDates) {
    EXPECT_EQ(described(Date{1795204500}), "2026-11-20 19:55:00 +0000");
    EXPECT_EQ(described(Value(Date{0})), "1970-01-01 00:00:00 +0000");
    EXPECT_EQ(described(Date{-1}), "1969-12-31 23:59:59 +0000");
    EXPECT_EQ(described(Date{253402300799}), "9999-12-31 23:59:59 +0000");
}

TEST(Description, OfADateThatNoCalendarShows) {
    EXPECT_EQ(described(Date{253402300800}), "253402300800 s");
    EXPECT_EQ(described(Date{std::numeric_limits<std::int64_t>::min()}), "-9223372036854775808 s");
}

TEST(Description, OfURLs) {
    EXPECT_EQ(described(URL::fileURLWithPath("/a b")), "file:///a%20b");
    EXPECT_EQ(described(Value(URL::fileURLWithPath("/a"))), "file:///a");
}

TEST(Description, OfAnError) {
    EXPECT_EQ(described(Error("D", 7, "It \"broke\".")), "Error Domain=D Code=7 \"It \\\"broke\\\".\"");
}

TEST(Description, OfAnErrorWithNestedUserInformation) {
    const Error inner = Error("Inner", -1, "Why").causedBy(Error("Deepest", 0, "a\"b"));
    const Error outer =
        Error("Outer", 2, "What").causedBy(inner).withPath("/tmp/a b").withURL("https://a.example/b");
    EXPECT_EQ(described(outer),
              "Error Domain=Outer Code=2 \"What\" UserInfo={FailingURL=https://a.example/b, FilePath=/tmp/a "
              "b, UnderlyingError={Error Domain=Inner "
              "Code=-1 \"Why\" UserInfo={UnderlyingError={Error Domain=Deepest Code=0 \"a\\\"b\"}}}}");
}

TEST(Description, OfNestedContainersIsIndented) {
    const Value value(Dictionary{
        {"b", Array{1, "two words", Value::Null{}}}, {"a key", Dictionary{{"x", "y"}}}, {"empty", Array{}}});
    EXPECT_EQ(described(value),
              "{\n"
              "    \"a key\" = {\n"
              "        x = y;\n"
              "    };\n"
              "    b = (\n"
              "        1,\n"
              "        \"two words\",\n"
              "        \"<null>\"\n"
              "    );\n"
              "    empty = (\n"
              "    );\n"
              "}");
}

TEST(Description, QuotesTextsOfSeveralWordsInAContainer) {
    const Value value(
        Array{Value("a\"\\"), Value(""), Value("a.b-c_/$"), Value(Date{0}), Value(Error("D", 1, "t"))});
    EXPECT_EQ(described(value),
              "(\n"
              "    \"a\\\"\\\\\",\n"
              "    \"\",\n"
              "    a.b-c_/$,\n"
              "    \"1970-01-01 00:00:00 +0000\",\n"
              "    \"Error Domain=D Code=1 \\\"t\\\"\"\n"
              ")");
}

TEST(Description, EscapesKeysAndTextsOfContainers) {
    EXPECT_EQ(described(Dictionary{{"k\x1B", "v\n"}}), "{\n    \"k\\x1b\" = \"v\\n\";\n}");
}

TEST(Description, OfADeepDocumentGrowsWithItsLengthOnly) {
    Value deep = Array{};
    for (int level = 0; level < 500; ++level) deep = Array{deep};
    // Opening and closing lines, each indented by at most 64 columns.
    EXPECT_LE(described(deep).size(), 2U * 501 * (64 + 2));
}

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
    EXPECT_EQ(format("%@", Error("D", 1, "t").withPath("/a\n")),
              "Error Domain=D Code=1 \"t\" UserInfo={FilePath=/a\\n}");
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
}  // namespace pinwell::values
