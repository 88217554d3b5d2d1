#include "values/json.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "support/text.h"
#include "values/date.h"
#include "values/url.h"
#include "values/value.h"

namespace pinwell::values {
namespace {

using base::asBytes;
using test::repeated;
using testing::HasSubstr;

Value parsed(std::string_view text) {
    auto result = parseJSON(asBytes(text));
    EXPECT_TRUE(result) << text << ": " << result.error().localizedDescription();
    return result ? *result : Value();
}

std::string jsonRefusal(std::string_view text) {
    const auto result = parseJSON(asBytes(text));
    if (result) return "it was read";
    EXPECT_EQ(result.error().domain(), base::kDataErrorDomain);
    return result.error().localizedDescription();
}

std::string written(const Value& value) {
    const auto result = serializeJSON(value);
    return result ? base::toString(*result) : "error: " + result.error().localizedDescription();
}

TEST(JSON, ReadsEveryKind) {
    EXPECT_EQ(
        parsed(R"({"a": [1, -2, 1.5, "t", true, false, null, {}, []]})"),
        Value(Dictionary{{"a", Array{1, -2, 1.5, "t", true, false, Value::Null{}, Dictionary{}, Array{}}}}));
}

TEST(JSON, KeepsIntegersOf64BitsExact) {
    const Value value = parsed("[18446744073709551615, -9223372036854775808, 9007199254740993]");
    EXPECT_EQ(value[0], Value(std::numeric_limits<std::uint64_t>::max()));
    EXPECT_EQ(value[1], Value(std::numeric_limits<std::int64_t>::min()));
    EXPECT_EQ(value[2], Value(std::int64_t{9007199254740993}));
}

TEST(JSON, ReadsLongerIntegersAsFractions) {
    EXPECT_EQ(parsed("[18446744073709551616]")[0], Value(18446744073709551616.0));
}

TEST(JSON, RefusesANumberThatNoDoubleHolds) {
    EXPECT_THAT(jsonRefusal("[1e999]"), HasSubstr("malformed"));
}

TEST(JSON, LetsTheLastOfEqualKeysWin) {
    EXPECT_EQ(parsed(R"({"a":1,"b":2,"a":3})")["a"], Value(3));
}

TEST(JSON, RefusesEqualKeysOnRequest) {
    const auto refused = [](std::string_view text) { return !parseJSON(asBytes(text), EqualKeys::refused); };
    EXPECT_TRUE(refused(R"({"a":1,"a":2})"));
    EXPECT_TRUE(refused(R"([{"a":{"b":1,"c":2,"\u0062":1}}])"));
    EXPECT_FALSE(refused(R"([{"a":{"a":1}},{"a":2}])"));
}

TEST(JSON, ReadsEscapesInText) {
    EXPECT_EQ(parsed(R"(["\"\\\/\b\f\n\r\t\u00e9\ud83d\udccc"])")[0],
              Value("\"\\/\b\f\n\r\t\xC3\xA9\xF0\x9F\x93\x8C"));
    EXPECT_EQ(*parsed(R"(["a\u0000b"])")[0].string(), std::string("a\0b", 3));
}

TEST(JSON, SkipsOneByteOrderMark) {
    EXPECT_EQ(parsed("\xEF\xBB\xBF[]"), Value(Array{}));
    EXPECT_THAT(jsonRefusal("\xEF\xBB\xBF\xEF\xBB\xBF[]"), HasSubstr("malformed at byte 3"));
}

TEST(JSON, AllowsWhiteSpaceAroundTheDocumentAndNothingElse) {
    EXPECT_EQ(parsed(" \t\r\n[] \n"), Value(Array{}));
    EXPECT_THAT(jsonRefusal("[] x"), HasSubstr("malformed at byte 3"));
    EXPECT_THAT(jsonRefusal("[][]"), HasSubstr("malformed at byte 2"));
    EXPECT_THAT(jsonRefusal(std::string_view("[]\0", 3)), HasSubstr("malformed at byte 2"));
    EXPECT_THAT(jsonRefusal(std::string_view("[]\0garbage", 10)), HasSubstr("malformed at byte 2"));
}

TEST(JSON, NamesThePositionOfAFault) {
    EXPECT_THAT(jsonRefusal(R"({"a": x})"), HasSubstr("malformed at byte 6"));
    EXPECT_THAT(jsonRefusal("[1, 2"), HasSubstr("malformed at byte 5"));
    EXPECT_THAT(jsonRefusal(""), HasSubstr("malformed at byte 0"));
}

TEST(JSON, RefusesTextsThatTheStandardRefuses) {
    for (const std::string_view text : {"[1,]",
                                        "{\"a\":1,}",
                                        "{a:1}",
                                        "['a']",
                                        "[01]",
                                        "[+1]",
                                        "[.5]",
                                        "[1.]",
                                        "[NaN]",
                                        "[Infinity]",
                                        "// c\n[]",
                                        "[/**/]",
                                        "[\"\n\"]",
                                        "[\"\\x\"]",
                                        "[\"\\ud800\"]",
                                        "[\"\\udc00\"]",
                                        "[\"\xFF\"]",
                                        "[\"\xC0\x80\"]",
                                        "[tru]",
                                        "{\"a\"}",
                                        "{1:2}",
                                        "]",
                                        "[}",
                                        "[\"a"})
        EXPECT_THAT(jsonRefusal(text), HasSubstr("malformed at byte")) << text;
}

TEST(JSON, RefusesATopLevelThatIsNoContainer) {
    for (const std::string_view text : {"1", "\"text\"", "null", "true"})
        EXPECT_THAT(jsonRefusal(text), HasSubstr("neither an object nor an array")) << text;
}

TEST(JSON, ReadsUpToTheLimitOfNestingAndNoDeeper) {
    EXPECT_TRUE(parseJSON(asBytes(repeated("[", 512) + repeated("]", 512))));
    EXPECT_THAT(jsonRefusal(repeated("[", 513) + repeated("]", 513)), HasSubstr("nested deeper than 512"));
    EXPECT_THAT(jsonRefusal(repeated("{\"a\":", 513) + "1" + repeated("}", 513)),
                HasSubstr("nested deeper than 512"));
}

TEST(JSON, RefusesMillionsOfLevelsWithoutExhaustingTheStack) {
    EXPECT_THAT(jsonRefusal(repeated("[", 5'000'000)), HasSubstr("nested deeper than 512"));
}

TEST(JSON, RefusesMoreValuesThanItsLimit) {
    EXPECT_THAT(jsonRefusal("[" + repeated("1,", kMaximumJSONValues) + "1]"),
                HasSubstr("more than 1000000 values"));
}

TEST(JSON, RefusesALongerDocumentThanItsLimit) {
    EXPECT_THAT(jsonRefusal("[]" + std::string(kMaximumJSONSize, ' ')),
                HasSubstr("longer than 67108864 bytes"));
}

TEST(JSON, WritesCompactlyWithSortedKeys) {
    EXPECT_EQ(written(Dictionary{{"b", Array{1, -2, 1.5, true, Value::Null{}}}, {"a", "t"}}),
              R"({"a":"t","b":[1,-2,1.5,true,null]})");
    EXPECT_EQ(written(Array{}), "[]");
    EXPECT_EQ(written(Dictionary{}), "{}");
}

TEST(JSON, WritesIntegersExactly) {
    EXPECT_EQ(
        written(Array{std::numeric_limits<std::uint64_t>::max(), std::numeric_limits<std::int64_t>::min()}),
        "[18446744073709551615,-9223372036854775808]");
}

TEST(JSON, EscapesTextThatItWrites) {
    EXPECT_EQ(written(Array{Value(std::string("\"\\\n\x01\0", 5)), "\xC3\xA9"}),
              "[\"\\\"\\\\\\n\\u0001\\u0000\",\"\xC3\xA9\"]");
}

TEST(JSON, ReadsItsOwnOutput) {
    const Value value(Dictionary{{"k\n", Array{0.1, 1e300, "x", Dictionary{{"", false}}}}});
    EXPECT_EQ(parsed(written(value)), value);
}

TEST(JSON, CannotWriteValuesOutsideOfItsForm) {
    EXPECT_THAT(written(Array{Value()}), HasSubstr("error: JSON cannot hold a value of this kind"));
    EXPECT_THAT(written(Array{base::toData("x")}), HasSubstr("error:"));
    EXPECT_THAT(written(Array{Date{1}}), HasSubstr("error:"));
    EXPECT_THAT(written(Array{URL::fileURLWithPath("/")}), HasSubstr("error:"));
    EXPECT_THAT(written(Array{base::Error("D", 1, "t")}), HasSubstr("error:"));
    EXPECT_THAT(written(Array{std::nan("")}), HasSubstr("not finite"));
    EXPECT_THAT(written(Array{"\xFF"}), HasSubstr("not UTF-8"));
    EXPECT_THAT(written(Dictionary{{"\xFF", 1}}), HasSubstr("not UTF-8"));
    EXPECT_THAT(written("text"), HasSubstr("top level"));
    EXPECT_THAT(written(Value()), HasSubstr("top level"));
}

TEST(JSON, CannotWriteDeeperThanItReads) {
    Value deep = Array{};
    for (int level = 1; level < 512; ++level) deep = Array{deep};
    EXPECT_TRUE(serializeJSON(deep));
    EXPECT_THAT(written(Array{deep}), HasSubstr("nested this deep"));
}

}  // namespace
}  // namespace pinwell::values
