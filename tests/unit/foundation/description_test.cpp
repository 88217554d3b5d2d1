#include "foundation/description.h"

#include <gtest/gtest.h>

#include "foundation/bytes.h"
#include "foundation/date.h"
#include "foundation/url.h"
#include "foundation/utf8.h"
#include "foundation/value.h"

namespace pinwell::foundation {
namespace {

template <class T>
std::string described(const T& object) {
    return Description<T>::of(object);
}

TEST(TerminalText, PassesOrdinaryTextThrough) {
    EXPECT_EQ(escapeForTerminal("plain, \\ \"quoted\" \xC3\xA9 \xE2\x82\xAC \xF0\x9F\x93\x8C"),
              "plain, \\ \"quoted\" \xC3\xA9 \xE2\x82\xAC \xF0\x9F\x93\x8C");
    EXPECT_EQ(escapeForTerminal(""), "");
}

TEST(TerminalText, EscapesControlCharacters) {
    EXPECT_EQ(escapeForTerminal("a\x1B[2Jb"), "a\\x1b[2Jb");
    EXPECT_EQ(escapeForTerminal("\n\r\t"), "\\n\\r\\t");
    EXPECT_EQ(escapeForTerminal("\x7F"), "\\x7f");
    EXPECT_EQ(escapeForTerminal(std::string_view("\0", 1)), "\\x00");
    EXPECT_EQ(escapeForTerminal("\xC2\x9B"
                                "31m"),
              "\\xc2\\x9b31m");
    EXPECT_EQ(escapeForTerminal("\xC2\xA0"), "\xC2\xA0");
}

TEST(TerminalText, EscapesMalformedUTF8ByteByByte) {
    EXPECT_EQ(escapeForTerminal("\xFF"), "\\xff");
    EXPECT_EQ(escapeForTerminal("a\x80z"), "a\\x80z");
    EXPECT_EQ(escapeForTerminal("\xC0\x9B"), "\\xc0\\x9b");                    // overlong escape
    EXPECT_EQ(escapeForTerminal("\xE0\x80\x9B"), "\\xe0\\x80\\x9b");           // the same, longer
    EXPECT_EQ(escapeForTerminal("\xED\xA0\x80"), "\\xed\\xa0\\x80");           // surrogate
    EXPECT_EQ(escapeForTerminal("\xF4\x90\x80\x80"), "\\xf4\\x90\\x80\\x80");  // past the last code point
    EXPECT_EQ(escapeForTerminal("\xE2\x82"), "\\xe2\\x82");                    // cut short
    EXPECT_EQ(escapeForTerminal("\xE2\x82"
                                "A"),
              "\\xe2\\x82"
              "A");
}

TEST(UTF8, KnowsTheLengthOfASequence) {
    EXPECT_EQ(utf8SequenceLength("a"), 1U);
    EXPECT_EQ(utf8SequenceLength("\xC3\xA9"), 2U);
    EXPECT_EQ(utf8SequenceLength("\xEF\xBF\xBF"), 3U);
    EXPECT_EQ(utf8SequenceLength("\xF4\x8F\xBF\xBF"), 4U);
    EXPECT_EQ(utf8SequenceLength(""), 0U);
    EXPECT_EQ(utf8SequenceLength("\xF5\x80\x80\x80"), 0U);
}

TEST(UTF8, IsAllOrNothing) {
    EXPECT_TRUE(isUTF8("a\xC3\xA9"));
    EXPECT_FALSE(isUTF8("a\xC3"));
    EXPECT_FALSE(isUTF8("\xC1\xBF"));
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
    const Error inner = Error("Inner", -1, "Why").with("Deep", Error("Deepest", 0, "a\"b"));
    const Error outer = Error("Outer", 2, "What").with("FilePath", "/tmp/a b").with("UnderlyingError", inner);
    EXPECT_EQ(
        described(outer),
        "Error Domain=Outer Code=2 \"What\" UserInfo={FilePath=/tmp/a b, UnderlyingError={Error Domain=Inner "
        "Code=-1 \"Why\" UserInfo={Deep={Error Domain=Deepest Code=0 \"a\\\"b\"}}}}");
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

}  // namespace
}  // namespace pinwell::foundation
