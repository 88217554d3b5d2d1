#include "runtime/queue.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <thread>
#include <vector>

namespace pinwell::runtime {
namespace {

// The counters below are plain on purpose: the thread sanitizer sees when the queue does not order its work.

TEST(SerialQueue, RunsWorkInTheOrderItWasHandedIn) {
    std::vector<int> order;
    SerialQueue queue("order");
    for (int i = 0; i < 1000; ++i) queue.async([&order, i] { order.push_back(i); });
    queue.sync([] {});
    ASSERT_EQ(order.size(), 1000U);
    for (int i = 0; i < 1000; ++i) EXPECT_EQ(order[static_cast<std::size_t>(i)], i);
}

TEST(SerialQueue, RunsOnePieceAtATime) {
    int running = 0;
    int most = 0;
    int done = 0;
    {
        SerialQueue queue("one");
        std::vector<std::thread> threads;
        for (int t = 0; t < 4; ++t)
            threads.emplace_back([&] {
                for (int i = 0; i < 200; ++i)
                    queue.async([&] {
                        most = std::max(most, ++running);
                        ++done;
                        --running;
                    });
            });
        for (std::thread& thread : threads) thread.join();
    }
    EXPECT_EQ(most, 1);
    EXPECT_EQ(done, 800);
}

TEST(SerialQueue, RunsEverythingQueuedBeforeItGoes) {
    int done = 0;
    {
        SerialQueue queue("drain");
        for (int i = 0; i < 100; ++i) queue.async([&] { ++done; });
    }
    EXPECT_EQ(done, 100);
}

TEST(SerialQueue, RunsWorkThatQueuedWorkHandsInWhileItGoes) {
    int done = 0;
    {
        SerialQueue queue("nested");
        queue.async([&] { queue.async([&] { queue.async([&] { ++done; }); }); });
    }
    EXPECT_EQ(done, 1);
}

TEST(SerialQueue, SyncReturnsWhenTheWorkHasRun) {
    SerialQueue queue("sync");
    int value = 0;
    queue.async([&] { value = 1; });
    queue.sync([&] { value *= 10; });
    EXPECT_EQ(value, 10);
}

TEST(SerialQueue, SyncOnItsOwnThreadRunsAtOnce) {
    SerialQueue queue("reentrant");
    std::vector<int> order;
    queue.sync([&] {
        order.push_back(1);
        queue.sync([&] { order.push_back(2); });
        order.push_back(3);
    });
    EXPECT_EQ(order, (std::vector<int>{1, 2, 3}));
}

TEST(SerialQueue, KnowsItsOwnThread) {
    SerialQueue queue("a name longer than the kernel keeps");
    SerialQueue other("other");
    bool onQueue = false;
    bool onOther = true;
    queue.sync([&] {
        onQueue = queue.isCurrent();
        onOther = other.isCurrent();
    });
    EXPECT_TRUE(onQueue);
    EXPECT_FALSE(onOther);
    EXPECT_FALSE(queue.isCurrent());
}

// Submits work in its destructor, like an object that a task may own.
struct LastWord {
    SerialQueue& queue;
    int& said;
    ~LastWord() {
        queue.async([&count = said] { ++count; });
    }
};

TEST(SerialQueue, LetsTheDestructorOfAWorksObjectAddWork) {
    int said = 0;
    {
        SerialQueue queue("owner");
        queue.async([owned = std::shared_ptr<LastWord>(new LastWord{queue, said})] { (void)owned; });
    }
    EXPECT_EQ(said, 1);
}

TEST(SerialQueueDeathTest, EndsTheProcessWhenWorkThrows) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_DEATH(
        {
            SerialQueue queue("thrower");
            queue.sync([] { throw 1; });
        },
        "");
    EXPECT_DEATH(
        {
            SerialQueue queue("thrower");
            queue.sync([&] {
                try {
                    queue.sync([] { throw 1; });
                } catch (int) {
                }
            });
        },
        "");
}

TEST(RunLoop, RunsUntilItIsStopped) {
    RunLoop loop;
    int done = 0;
    SerialQueue queue("worker");
    queue.async([&] {
        done = 1;
        loop.stop();
    });
    loop.run();
    EXPECT_EQ(done, 1);
}

TEST(RunLoop, ReturnsAtOnceWhenItWasStoppedBefore) {
    RunLoop loop;
    loop.stop();
    int returns = 0;
    for (; returns < 2; ++returns) loop.run();
    EXPECT_EQ(returns, 2);
}

}  // namespace
}  // namespace pinwell::runtime
