#include "foundation/byte_count.h"

#include <gtest/gtest.h>

#include <limits>

namespace pinwell::foundation {
namespace {

constexpr std::uint64_t kKilo = 1024;
constexpr std::uint64_t kMega = 1024 * kKilo;
constexpr std::uint64_t kGiga = 1024 * kMega;

TEST(ByteCount, SpellsOutNothing) {
    EXPECT_EQ(formatByteCount(0), "Zero KB");
}

TEST(ByteCount, CountsBytesBelowAKilobyte) {
    EXPECT_EQ(formatByteCount(1), "1 byte");
    EXPECT_EQ(formatByteCount(512), "512 bytes");
    EXPECT_EQ(formatByteCount(1023), "1023 bytes");
}

TEST(ByteCount, ShowsKilobytesWithoutFraction) {
    EXPECT_EQ(formatByteCount(kKilo), "1 KB");
    EXPECT_EQ(formatByteCount(kKilo + 511), "1 KB");
    EXPECT_EQ(formatByteCount(kKilo + 512), "2 KB");
}

TEST(ByteCount, ShowsMegabytesWithOneDigit) {
    EXPECT_EQ(formatByteCount(kMega + kMega / 2), "1.5 MB");
    EXPECT_EQ(formatByteCount(64 * kMega), "64 MB");
    EXPECT_EQ(formatByteCount(kMega + 1), "1 MB");
}

TEST(ByteCount, ShowsGigabytesWithTwoDigits) {
    EXPECT_EQ(formatByteCount(2 * kGiga + kGiga / 4), "2.25 GB");
    EXPECT_EQ(formatByteCount(2 * kGiga + kGiga / 2), "2.5 GB");
    EXPECT_EQ(formatByteCount(kGiga + kGiga / 50), "1.02 GB");
}

TEST(ByteCount, ShowsWhatRoundsUpToAThousandAsTheNextUnit) {
    EXPECT_EQ(formatByteCount(kMega - 1), "1 MB");
    EXPECT_EQ(formatByteCount(kGiga - 1), "1 GB");
}

TEST(ByteCount, HoldsTheLargestCount) {
    EXPECT_EQ(formatByteCount(std::numeric_limits<std::uint64_t>::max()), "16 EB");
    EXPECT_EQ(formatByteCount(std::uint64_t{1} << 60U), "1 EB");
    EXPECT_EQ(formatByteCount((std::uint64_t{1} << 60U) + (std::uint64_t{1} << 58U)), "1.25 EB");
}

}  // namespace
}  // namespace pinwell::foundation
