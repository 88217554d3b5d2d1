#include "lumora-local/admin_service.h"

#include <gtest/gtest.h>

#include <atomic>
#include <thread>
#include <vector>

namespace pinwell::lumora {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

class TokenBucketsTest : public testing::Test {
  protected:
    TokenBuckets buckets(std::int64_t burst, milliseconds interval, std::size_t clients = 8) {
        return TokenBuckets({burst, interval}, clients, [this] { return now_; });
    }

    TokenBuckets::Clock::time_point now_{seconds(1000)};
};

TEST_F(TokenBucketsTest, AllowABurstAndThenOneTokenAnInterval) {
    TokenBuckets tokens = buckets(3, seconds(2));
    for (int i = 0; i < 3; ++i) EXPECT_EQ(tokens.take("a"), std::nullopt) << i;
    EXPECT_EQ(tokens.take("a"), 2);
    now_ += milliseconds(1500);
    EXPECT_EQ(tokens.take("a"), 1);
    now_ += milliseconds(500);
    EXPECT_EQ(tokens.take("a"), std::nullopt);
    EXPECT_EQ(tokens.take("a"), 2);
}

TEST_F(TokenBucketsTest, AreRefilledToTheirBurstAtMost) {
    TokenBuckets tokens = buckets(2, seconds(1));
    EXPECT_FALSE(tokens.take("a"));
    EXPECT_FALSE(tokens.take("a"));
    now_ += seconds(1000);
    EXPECT_FALSE(tokens.take("a"));
    EXPECT_FALSE(tokens.take("a"));
    EXPECT_TRUE(tokens.take("a"));
}

TEST_F(TokenBucketsTest, BelongToOneClientEach) {
    TokenBuckets tokens = buckets(1, seconds(1));
    EXPECT_FALSE(tokens.take("a"));
    EXPECT_FALSE(tokens.take("b"));
    EXPECT_TRUE(tokens.take("a"));
}

TEST_F(TokenBucketsTest, ReturnAWaitOfAtLeastASecond) {
    TokenBuckets tokens = buckets(1, milliseconds(50));
    EXPECT_FALSE(tokens.take("a"));
    EXPECT_EQ(tokens.take("a"), 1);
}

TEST_F(TokenBucketsTest, RemoveTheLeastRecentlyUsedClient) {
    TokenBuckets tokens = buckets(1, seconds(1000), 2);
    EXPECT_FALSE(tokens.take("a"));
    EXPECT_FALSE(tokens.take("b"));
    EXPECT_TRUE(tokens.take("a"));
    EXPECT_FALSE(tokens.take("c"));  // it replaces b
    EXPECT_EQ(tokens.size(), 2U);
    EXPECT_TRUE(tokens.take("a"));
    EXPECT_FALSE(tokens.take("b"));
}

TEST_F(TokenBucketsTest, GiveNoTokenTwiceToSeveralThreads) {
    TokenBuckets tokens = buckets(100, seconds(1000));
    std::atomic<int> taken{0};
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i) {
        threads.emplace_back([&] {
            for (int j = 0; j < 100; ++j) {
                if (!tokens.take("a")) ++taken;
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(taken, 100);
}

}  // namespace
}  // namespace pinwell::lumora
