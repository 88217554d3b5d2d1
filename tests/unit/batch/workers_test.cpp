// Threads that take tasks from one queue.
#include "batch/workers.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <future>

namespace pinwell::test {
namespace {

using batch::Workers;

TEST(Workers, RunTheirTasks) {
    std::atomic<int> done = 0;
    std::promise<void> all;
    {
        Workers workers(4);
        for (int i = 0; i < 1000; ++i)
            workers.add([&] {
                if (++done == 1000) all.set_value();
            });
        all.get_future().wait();
    }
    EXPECT_EQ(done, 1000);
}

TEST(Workers, AreNoMoreThanTheMaximum) {
    std::atomic<int> inside = 0;
    std::atomic<int> most = 0;
    std::promise<void> all;
    Workers workers(3);
    for (int i = 0; i < 300; ++i)
        workers.add([&, i] {
            const int now = ++inside;
            int before = most;
            while (before < now && !most.compare_exchange_weak(before, now)) {
            }
            --inside;
            if (i == 299) all.set_value();
        });
    all.get_future().wait();
    EXPECT_LE(most, 3);
}

TEST(Workers, TakeUrgentTasksFirst) {
    std::vector<int> order;
    std::promise<void> mayGoOn;
    std::promise<void> all;
    Workers workers(1);
    workers.add([future = mayGoOn.get_future().share()] { future.wait(); });
    workers.add([&] { order.push_back(1); });
    workers.add([&] {
        order.push_back(2);
        all.set_value();
    });
    workers.add([&] { order.push_back(3); }, true);
    mayGoOn.set_value();
    all.get_future().wait();
    EXPECT_THAT(order, testing::ElementsAre(3, 1, 2));
}

TEST(Workers, DropUnbegunTasksAtTheirEnd) {
    std::atomic<int> done = 0;
    std::promise<void> begun;
    std::promise<void> mayGoOn;
    auto ending = std::make_unique<Workers>(1);
    ending->add([&, future = mayGoOn.get_future().share()] {
        begun.set_value();
        future.wait();
        ++done;
    });
    ending->add([&] { ++done; });
    begun.get_future().wait();
    std::thread end([&] { ending.reset(); });
    mayGoOn.set_value();
    end.join();
    EXPECT_GE(done, 1);
}

}  // namespace
}  // namespace pinwell::test
