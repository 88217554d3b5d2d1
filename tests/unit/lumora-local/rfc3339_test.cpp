#include "lumora-local/rfc3339.h"

#include <gtest/gtest.h>

namespace pinwell::lumora {
namespace {

using values::Date;

TEST(Rfc3339, WritesUtcInWholeSeconds) {
    EXPECT_EQ(toRfc3339(Date{1'795'000'000}), "2026-11-18T11:06:40Z");
    EXPECT_EQ(toRfc3339(Date{0}), "1970-01-01T00:00:00Z");
    EXPECT_EQ(toRfc3339(Date{-1}), "1969-12-31T23:59:59Z");
}

TEST(Rfc3339, ReadsWhatItWrites) {
    EXPECT_EQ(parseRfc3339("2026-11-18T11:06:40Z"), Date{1'795'000'000});
}

TEST(Rfc3339, ReadsOffsetsAndFractions) {
    EXPECT_EQ(parseRfc3339("2026-11-18T12:36:40+01:30"), Date{1'795'000'000});
    EXPECT_EQ(parseRfc3339("2026-11-18t06:06:40.987-05:00"), Date{1'795'000'000});
}

TEST(Rfc3339, ReadsADateAsItsFirstSecond) {
    EXPECT_EQ(parseRfc3339("1970-01-02"), Date{86'400});
}

TEST(Rfc3339, RefusesOtherTexts) {
    for (const char* text :
         {"", "now", "2026", "2026-02-30", "2026-13-01", "2026-11-18T", "2026-11-18T11:06Z",
          "2026-11-18T24:00:00Z", "2026-11-18T11:06:40", "2026-11-18T11:06:40Z ", "2026-11-18T11:06:40.Z",
          "2026-11-18T11:06:40+0100", "-026-11-18", "+2026-11-18"}) {
        EXPECT_EQ(parseRfc3339(text), std::nullopt) << text;
    }
}

}  // namespace
}  // namespace pinwell::lumora
