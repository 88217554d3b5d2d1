#include "values/value.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "base/error.h"

namespace pinwell::values {
namespace {

using base::Error;
using base::Result;
using base::toData;

TEST(Value, ReturnsNilForEveryAccessToNil) {
    const Value nil;
    EXPECT_TRUE(nil.isNil());
    EXPECT_TRUE(nil["a"].isNil());
    EXPECT_TRUE(nil[std::size_t{5}]["b"].isNil());
    EXPECT_TRUE(Value(nullptr).isNil());
}

TEST(Value, ReturnsNilForAMissingKey) {
    const Value dictionary(Dictionary{{"a", Dictionary{{"b", 1}}}});
    EXPECT_EQ(dictionary["a"]["b"], Value(1));
    EXPECT_TRUE(dictionary["x"].isNil());
    EXPECT_TRUE(dictionary["x"]["y"].isNil());
}

TEST(Value, RefusesASubscriptThatItsKindHasNot) {
    EXPECT_THROW(Value("text")["a"], ValueTypeError);
    EXPECT_THROW(Value(Array{1})["a"], ValueTypeError);
    EXPECT_THROW(Value(Dictionary{})[0], ValueTypeError);
    EXPECT_THROW(Value(1)[0], ValueTypeError);
}

TEST(Value, DistinguishesAJSONNullFromNil) {
    const Value null(Value::Null{});
    EXPECT_TRUE(null.isNull());
    EXPECT_FALSE(null.isNil());
    EXPECT_THROW(null["a"], ValueTypeError);
    EXPECT_THROW(null[0], ValueTypeError);
    EXPECT_NE(null, Value());
}

TEST(Value, RefusesAnIndexPastTheEnd) {
    const Value array(Array{1, 2});
    EXPECT_EQ(array[1], Value(2));
    EXPECT_THROW(array[2], std::out_of_range);
    EXPECT_THROW(Value(Array{})[0], std::out_of_range);
}

TEST(Value, GivesEachKindOnlyAsItself) {
    const Value text("t");
    EXPECT_NE(text.string(), nullptr);
    EXPECT_EQ(text.data(), nullptr);
    EXPECT_EQ(text.array(), nullptr);
    EXPECT_EQ(text.dictionary(), nullptr);
    EXPECT_EQ(text.boolean(), nullptr);
    EXPECT_EQ(text.url(), nullptr);
    EXPECT_EQ(text.error(), nullptr);
    EXPECT_EQ(text.date(), nullptr);
    EXPECT_EQ(Value(1).boolean(), nullptr);
    EXPECT_NE(Value(1).integer(), nullptr);
    EXPECT_NE(Value(1U).unsignedInteger(), nullptr);
    EXPECT_NE(Value(1.0).real(), nullptr);
}

TEST(Value, CountsBooleansAsNumbers) {
    EXPECT_TRUE(Value(true).isNumber());
    EXPECT_TRUE(Value(1.5).isNumber());
    EXPECT_FALSE(Value("1").isNumber());
    EXPECT_FALSE(Value().isNumber());
}

TEST(Value, ConvertsNumbersToUnsignedWords) {
    EXPECT_EQ(Value(true).unsignedIntegerValue(), 1U);
    EXPECT_EQ(Value(-1).unsignedIntegerValue(), 18446744073709551615U);
    EXPECT_EQ(Value(2.9).unsignedIntegerValue(), 2U);
    EXPECT_EQ(Value(-2.9).unsignedIntegerValue(), 18446744073709551614U);
    EXPECT_EQ(Value(-0.5).unsignedIntegerValue(), 0U);
    EXPECT_EQ(Value("12").unsignedIntegerValue(), 0U);
    EXPECT_EQ(Value().unsignedIntegerValue(), 0U);
}

TEST(Value, SaturatesNumbersThatDoNotFit) {
    constexpr double infinity = std::numeric_limits<double>::infinity();
    EXPECT_EQ(Value(1e300).unsignedIntegerValue(), 18446744073709551615U);
    EXPECT_EQ(Value(18446744073709551616.0).unsignedIntegerValue(), 18446744073709551615U);
    EXPECT_EQ(Value(infinity).unsignedIntegerValue(), 18446744073709551615U);
    EXPECT_EQ(Value(-1e300).unsignedIntegerValue(), 9223372036854775808U);
    EXPECT_EQ(Value(-infinity).unsignedIntegerValue(), 9223372036854775808U);
    EXPECT_EQ(Value(std::nan("")).unsignedIntegerValue(), 0U);
}

TEST(Value, IsTrueWhenItIsANumberOtherThanZero) {
    EXPECT_TRUE(Value(true).boolValue());
    EXPECT_TRUE(Value(-3).boolValue());
    EXPECT_TRUE(Value(0.1).boolValue());
    EXPECT_FALSE(Value(0.0).boolValue());
    EXPECT_FALSE(Value("true").boolValue());
    EXPECT_FALSE(Value().boolValue());
}

TEST(Value, ComparesNumbersByTheirValue) {
    EXPECT_EQ(Value(1), Value(1U));
    EXPECT_NE(Value(-1), Value(std::uint64_t{18446744073709551615U}));
    EXPECT_NE(Value(1), Value(true));
    EXPECT_NE(Value(1), Value("1"));
}

TEST(Value, ComparesContainersByTheirContents) {
    EXPECT_EQ(Value(Array{1, Dictionary{{"a", toData("x")}}}),
              Value(Array{1, Dictionary{{"a", toData("x")}}}));
    EXPECT_NE(Value(Array{1}), Value(Array{2}));
    EXPECT_EQ(Value(URL::fileURLWithPath("/a")), Value(URL::fileURLWithPath("/a/")));
    EXPECT_EQ(Value(Error("D", 1, "t")), Value(Error("D", 1, "t")));
    EXPECT_NE(Value(Date{1}), Value(Date{2}));
}

TEST(Result, DistinguishesAnErrorFromAnErrorValue) {
    const Result<Value> failed = Error("D", 1, "t");
    const Result<Value> holding = Value(Error("D", 1, "t"));
    EXPECT_FALSE(failed);
    EXPECT_TRUE(holding);
}

}  // namespace
}  // namespace pinwell::values
