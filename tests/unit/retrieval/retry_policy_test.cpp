// The delay before a retry.
#include "retrieval/retry_policy.h"

#include <gtest/gtest.h>

namespace pinwell::test {
namespace {

using retrieval::Clock;
using retrieval::RetryPolicy;
using std::chrono::milliseconds;
using std::chrono::seconds;

TEST(RetryPolicy, DoublesTheFirstDelayBeforeEachFurtherTry) {
    const RetryPolicy policy;
    EXPECT_EQ(policy.delayAfter(1, std::nullopt, 0), seconds(1));
    EXPECT_EQ(policy.delayAfter(2, std::nullopt, 0), seconds(2));
    EXPECT_EQ(policy.delayAfter(3, std::nullopt, 0), seconds(4));
    const RetryPolicy quick{.retries = 1, .firstDelay = std::chrono::duration<double>(0.25)};
    EXPECT_EQ(quick.delayAfter(1, std::nullopt, 0), milliseconds(250));
}

TEST(RetryPolicy, WaitsNoLongerThanAMinute) {
    const RetryPolicy policy;
    for (const unsigned failures : {7U, 8U, 100U, 4'000'000'000U})
        EXPECT_EQ(policy.delayAfter(failures, std::nullopt, 0), seconds(60)) << failures;
    const RetryPolicy patient{.retries = 1, .firstDelay = seconds(1'000'000)};
    EXPECT_EQ(patient.delayAfter(1, std::nullopt, 0), seconds(60));
}

TEST(RetryPolicy, SpreadsClientsOverHalfAsLongAgain) {
    const RetryPolicy policy;
    EXPECT_EQ(policy.delayAfter(1, std::nullopt, 0.5), milliseconds(1250));
    EXPECT_EQ(policy.delayAfter(1, std::nullopt, 1), milliseconds(1500));
}

TEST(RetryPolicy, AServersWishTakesThePlaceOfOurChoice) {
    const RetryPolicy policy;
    EXPECT_EQ(policy.delayAfter(5, seconds(7), 0), seconds(7));
    EXPECT_EQ(policy.delayAfter(5, seconds(0), 1), seconds(0));
    EXPECT_EQ(policy.delayAfter(1, seconds(100), 1), seconds(105));
}

TEST(RetryPolicy, AServersWishIsNoLongerThanTenMinutes) {
    const RetryPolicy policy;
    EXPECT_EQ(policy.delayAfter(1, seconds::max(), 0), seconds(600));
    EXPECT_EQ(policy.delayAfter(1, seconds(-5), 0), seconds(0));
}

TEST(RetryPolicy, PollsBetweenTenTimesASecondAndTwiceAMinute) {
    const RetryPolicy eager{.retries = 1, .firstDelay = seconds(0)};
    EXPECT_EQ(eager.pollDelayAfter(1, 0), milliseconds(100));
    const RetryPolicy policy;
    EXPECT_EQ(policy.pollDelayAfter(1, 0), seconds(1));
    EXPECT_EQ(policy.pollDelayAfter(20, 1), seconds(30));
}

TEST(RetryPolicy, ChanceIsFromZeroToOne) {
    for (int i = 0; i < 1000; ++i) {
        const double chance = retrieval::randomChance();
        EXPECT_GE(chance, 0);
        EXPECT_LE(chance, 1);
    }
}

}  // namespace
}  // namespace pinwell::test
