#include "runtime/signals.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <atomic>
#include <csignal>
#include <cstdlib>
#include <optional>
#include <thread>
#include <vector>

namespace pinwell::runtime {
namespace {

std::atomic<int> taken = 0;

class Deferral : public testing::Test {
  protected:
    Deferral() {
        taken = 0;
        for (const int number : {SIGHUP, SIGINT, SIGTERM}) std::signal(number, [](int) { ++taken; });
    }
    ~Deferral() override {
        for (const int number : {SIGHUP, SIGINT, SIGTERM}) std::signal(number, SIG_DFL);
    }

    static void send(int number) { kill(getpid(), number); }
};

TEST_F(Deferral, LetsSignalsHaveTheirEffectWhenItEnds) {
    {
        const SignalDeferral deferral;
        for (const int number : {SIGHUP, SIGINT, SIGTERM}) send(number);
        EXPECT_EQ(taken, 0);
    }
    EXPECT_EQ(taken, 3);
}

TEST_F(Deferral, PassesOnNoSignalThatDidNotCome) {
    { const SignalDeferral deferral; }
    EXPECT_EQ(taken, 0);
    send(SIGINT);
    EXPECT_EQ(taken, 1);
}

TEST_F(Deferral, ForgetsTheSignalsOfAnEarlierOne) {
    {
        const SignalDeferral deferral;
        send(SIGINT);
    }
    { const SignalDeferral deferral; }
    EXPECT_EQ(taken, 1);
}

TEST_F(Deferral, HoldsForSignalsThatAnotherThreadTakes) {
    std::optional<SignalDeferral> deferral(std::in_place);
    std::thread([] { pthread_kill(pthread_self(), SIGTERM); }).join();
    EXPECT_EQ(taken, 0);
    deferral.reset();
    EXPECT_EQ(taken, 1);
}

TEST_F(Deferral, LetsASignalHaveItsEffectInTheThreadThatEndsIt) {
    static std::atomic<pid_t> taker;
    taker = 0;
    std::signal(SIGTERM, [](int) { taker = gettid(); });
    std::thread([] {
        std::optional<SignalDeferral> deferral(std::in_place);
        pthread_kill(pthread_self(), SIGTERM);
        deferral.reset();
        EXPECT_EQ(taker, gettid());
    }).join();
}

TEST_F(Deferral, LeavesASignalToOthersIfTheThreadThatEndsItBlocksIt) {
    std::optional<SignalDeferral> deferral(std::in_place);
    send(SIGTERM);
    std::thread([&] {
        sigset_t blocked;
        sigemptyset(&blocked);
        sigaddset(&blocked, SIGTERM);
        pthread_sigmask(SIG_BLOCK, &blocked, nullptr);
        deferral.reset();
    }).join();
    while (taken == 0) std::this_thread::yield();  // this thread has to take the signal
    EXPECT_EQ(taken, 1);
}

TEST_F(Deferral, OfSeveralTheLastOneLetsSignalsThrough) {
    std::optional<SignalDeferral> first(std::in_place);
    std::optional<SignalDeferral> second(std::in_place);
    send(SIGTERM);
    first.reset();
    EXPECT_EQ(taken, 0);
    second.reset();
    EXPECT_EQ(taken, 1);
}

TEST_F(Deferral, MayLiveInManyThreadsAtOnce) {
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i)
        threads.emplace_back([] {
            for (int round = 0; round < 200; ++round) const SignalDeferral deferral;
        });
    for (int i = 0; i < 50; ++i) send(SIGTERM);
    for (std::thread& thread : threads) thread.join();
    send(SIGINT);
    EXPECT_GT(taken, 1);
}

// A thread may run the handler late: the kernel chose it during the deferral's life.
class DeferralWithALateHandler : public Deferral {
  protected:
    static auto handler() {
        struct sigaction installed {};
        sigaction(SIGTERM, nullptr, &installed);
        return installed.sa_handler;
    }
};

TEST_F(DeferralWithALateHandler, LosesNoSignalThatIsHandledAfterItsEnd) {
    std::optional<SignalDeferral> deferral(std::in_place);
    const auto late = handler();
    deferral.reset();
    late(SIGTERM);
    EXPECT_EQ(taken, 1);
}

TEST_F(DeferralWithALateHandler, LeavesSuchASignalToTheNextDeferral) {
    std::optional<SignalDeferral> deferral(std::in_place);
    const auto late = handler();
    deferral.reset();
    deferral.emplace();
    late(SIGTERM);
    EXPECT_EQ(taken, 0);
    deferral.reset();
    EXPECT_EQ(taken, 1);
}

TEST_F(Deferral, LeavesAnIgnoredSignalIgnored) {
    std::signal(SIGHUP, SIG_IGN);
    {
        const SignalDeferral deferral;
        send(SIGHUP);
    }
    EXPECT_EQ(taken, 0);
    struct sigaction now {};
    sigaction(SIGHUP, nullptr, &now);
    EXPECT_EQ(now.sa_handler, SIG_IGN);
}

TEST(DeferralDeathTest, EndsTheProcessAfterwards) {
    EXPECT_EXIT(
        {
            {
                const SignalDeferral deferral;
                kill(getpid(), SIGTERM);
                std::fputs("finished", stderr);
            }
            std::_Exit(0);
        },
        testing::KilledBySignal(SIGTERM), "finished");
}

}  // namespace
}  // namespace pinwell::runtime
