// The end of a process that runs away. Each is a child, because its limits cannot be lifted.
#include "sandbox/sandbox.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <csignal>
#include <cstdint>
#include <functional>
#include <string>
#include <thread>

#include "child_process.h"
#include "runtime/process.h"
#include "runtime/signals.h"

namespace pinwell::test {
namespace {

const std::atomic<std::int32_t> kStatus{65};

// Runs a child under a limit of one second, and returns its end.
ChildEnd endOf(const std::function<void(int output)>& body) {
    return endOfChild([&](int output) {
        const rlimit none{0, 0};
        setrlimit(RLIMIT_CORE, &none);
        sandbox::limitRunaways(1, {output, "time", "stack", &kStatus});
        body(output);
        return 0;
    });
}

void useProcessorTime(rlim_t seconds) {
    rusage used{};
    do getrusage(RUSAGE_SELF, &used);
    while (static_cast<rlim_t>(used.ru_utime.tv_sec + used.ru_stime.tv_sec) < seconds);
}

// Deeper than any stack. It goes through a variable pointer; otherwise the compiler would make it a loop.
int fall(int depth);
int (*volatile further)(int) = fall;

int fall(int depth) {
    std::array<volatile char, 4096> frame{};
    frame[0] = static_cast<char>(depth);
    return further(depth + 1) + frame[0];
}

#ifdef __SANITIZE_THREAD__
constexpr bool kSignalsWait = true;  // until the program makes a call at which the sanitizer delivers them
#else
constexpr bool kSignalsWait = false;
#endif

TEST(Runaway, ThatUsesUpItsProcessorTimeEndsWithOneLine) {
    if (kSignalsWait) GTEST_SKIP() << "this sanitizer keeps signals from a program that only computes";
    const ChildEnd end = endOf([](int) { useProcessorTime(10); });
    ASSERT_TRUE(WIFEXITED(end.status));
    EXPECT_EQ(WEXITSTATUS(end.status), 65);
    EXPECT_EQ(end.said, "time\n");
}

TEST(Runaway, EndsWhenTheWriteThatItIsInHasEnded) {
    const ChildEnd end = endOf([](int output) {
        const runtime::SignalDeferral writing;
        raise(SIGXCPU);
        [[maybe_unused]] const ssize_t written = write(output, "written\n", 8);
    });
    EXPECT_EQ(WEXITSTATUS(end.status), 65);
    EXPECT_EQ(end.said, "written\ntime\n");
}

TEST(Runaway, PrintsNothingIfItMayNot) {
    const ChildEnd end = endOf([](int) {
        sandbox::limitRunaways(1, {-1, "time", "stack", &kStatus});
        raise(SIGXCPU);
    });
    EXPECT_EQ(WEXITSTATUS(end.status), 65);
    EXPECT_EQ(end.said, "");
}

TEST(Runaway, ThatUsesUpItsStackEndsWithOneLine) {
    if (runtime::kSanitized) GTEST_SKIP() << "the sanitizer has a handler of its own";
    const ChildEnd end = endOf([](int) {
        const runtime::StackGuard guard;
        fall(0);
    });
    ASSERT_TRUE(WIFEXITED(end.status));
    EXPECT_EQ(WEXITSTATUS(end.status), 65);
    EXPECT_EQ(end.said, "stack\n");
}

TEST(Runaway, MayBeAnyThreadWithAGuard) {
    if (runtime::kSanitized) GTEST_SKIP() << "the sanitizer has a handler of its own";
    const ChildEnd end = endOf([](int) {
        std::thread([] {
            const runtime::StackGuard guard;
            fall(0);
        }).join();
    });
    EXPECT_EQ(WEXITSTATUS(end.status), 65);
    EXPECT_EQ(end.said, "stack\n");
}

TEST(Runaway, IsNoOtherCrash) {
    if (runtime::kSanitized) GTEST_SKIP() << "the sanitizer has a handler of its own";
    const auto ways = {std::function<void(int)>([](int) {
                           const runtime::StackGuard guard;
                           volatile int* volatile nowhere = nullptr;
                           *nowhere = 1;  // NOLINT: meant to crash
                       }),
                       std::function<void(int)>([](int) {
                           const runtime::StackGuard guard;
                           raise(SIGSEGV);
                       })};
    for (const auto& crash : ways) {
        const ChildEnd end = endOf(crash);
        EXPECT_TRUE(WIFSIGNALED(end.status));
        EXPECT_EQ(WTERMSIG(end.status), SIGSEGV);
        EXPECT_EQ(end.said, "");
    }
}

TEST(Runaway, KeepsALowerLimitOfTheCallers) {
    const ChildEnd end = endOf([](int output) {
        sandbox::limitRunaways(1000, {output, "time", "stack", &kStatus});
        rlimit limit{};
        getrlimit(RLIMIT_CPU, &limit);
        _exit(static_cast<int>(limit.rlim_cur));
    });
    EXPECT_EQ(WEXITSTATUS(end.status), 1);
}

TEST(Runaway, IsAllowedMoreForALongerInput) {
    const std::uint64_t least = sandbox::processorSecondsFor(0);
    EXPECT_EQ(sandbox::processorSecondsFor(1000), least);
    constexpr std::uint64_t kGibibyte = std::uint64_t{1} << 30U;
    EXPECT_GE(sandbox::processorSecondsFor(100 * kGibibyte), least + 100 * 1024);
}

}  // namespace
}  // namespace pinwell::test
