#include "runtime/signals.h"

#include <pthread.h>
#include <sys/auxv.h>
#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <csignal>
#include <cstdint>
#include <cstring>
#include <mutex>

#include "runtime/process.h"

namespace pinwell::runtime {
namespace {

constexpr std::array kDeferred{SIGHUP, SIGINT, SIGTERM, SIGXCPU};

// A handler gets only its signal's number. So its results, and the handlers to restore, must be in global
// variables.
std::array<std::atomic<bool>, kDeferred.size()> arrived;
static_assert(std::atomic<bool>::is_always_lock_free, "a signal handler may touch nothing else");
std::array<struct sigaction, kDeferred.size()> before;

// With several deferrals, the first one defers the signals, and the last one releases them.
std::mutex mutex;
std::size_t alive = 0;

// Whether a deferral exists, for the handler, which must not wait for the mutex.
std::atomic<bool> deferring = false;

// This thread takes the signal before it goes on: with several threads, kill(2) may choose another one, which
// may run too late.
void passOn(std::size_t i) {
    if (arrived.at(i).exchange(false)) raise(kDeferred.at(i));
}

// If this thread blocks the signal, other threads take it.
void passOnFromOutside(std::size_t i) {
    sigset_t blocked;
    pthread_sigmask(SIG_BLOCK, nullptr, &blocked);
    if (sigismember(&blocked, kDeferred.at(i)) == 0) return passOn(i);
    if (arrived.at(i).exchange(false)) kill(getpid(), kDeferred.at(i));
}

// A thread may run this handler only after the deferral has ended and has read the flags for the
// last time. So the handler first sets its flag and then checks whether a deferral exists. The
// deferral first marks its end and then reads the flags. The later of the two sees the other's
// write.
void note(int number) {
    const int error = errno;
    for (std::size_t i = 0; i < kDeferred.size(); ++i) {
        if (kDeferred.at(i) != number) continue;
        arrived.at(i) = true;
        if (!deferring) passOn(i);  // delivered when the handler returns
    }
    errno = error;
}

// Stack for a handler and the functions that it calls.
constexpr std::size_t kHandlerStack = std::size_t{64} * 1024;

// The distance beyond the end that one call can reach: the kernel keeps a gap of 1 MiB below the main
// thread's stack.
constexpr std::uintptr_t kReach = std::uintptr_t{1024} * 1024;

// The lowest address of the thread's stack; 0 without a guard.
thread_local std::uintptr_t lowest = 0;

// The kernel lets the main thread's stack grow down from its top to the limit. At the very top, after the
// program's file name, is one word. pthread_getattr_np(3) would read all of /proc/self/maps to find the top.
std::uintptr_t endOfMainStack() {
    const auto fileName = static_cast<std::uintptr_t>(getauxval(AT_EXECFN));
    rlimit limit{};
    if (fileName == 0 || getrlimit(RLIMIT_STACK, &limit) != 0 || limit.rlim_cur == RLIM_INFINITY) return 0;
    const auto page = static_cast<std::uintptr_t>(sysconf(_SC_PAGESIZE));
    const auto* const text = reinterpret_cast<const char*>(fileName);  // NOLINT: a number as an address
    const std::uintptr_t used = fileName + std::strlen(text) + 1 + sizeof(void*);
    const std::uintptr_t top = (used + page - 1) / page * page;
    return top - std::min<std::uintptr_t>(top, limit.rlim_cur);
}

std::uintptr_t endOfThisStack() {
    if (gettid() == getpid()) return endOfMainStack();
    pthread_attr_t attributes{};
    if (pthread_getattr_np(pthread_self(), &attributes) != 0) return 0;
    void* address = nullptr;
    std::size_t size = 0;
    const int failure = pthread_attr_getstack(&attributes, &address, &size);
    pthread_attr_destroy(&attributes);
    return failure == 0 ? reinterpret_cast<std::uintptr_t>(address) : 0;  // NOLINT: an address as a number
}

}  // namespace

SignalDeferral::SignalDeferral() {
    const std::lock_guard lock(mutex);
    if (alive++ > 0) return;
    deferring = true;
    struct sigaction noting {};
    noting.sa_handler = note;
    noting.sa_flags = SA_RESTART;  // other code must not notice
    sigemptyset(&noting.sa_mask);
    for (std::size_t i = 0; i < kDeferred.size(); ++i) {
        sigaction(kDeferred.at(i), nullptr, &before.at(i));
        // Ignored from the start, for example by nohup(1): the caller chose that.
        if (before.at(i).sa_handler != SIG_IGN) sigaction(kDeferred.at(i), &noting, nullptr);
    }
}

SignalDeferral::~SignalDeferral() {
    {
        const std::lock_guard lock(mutex);
        if (--alive > 0) return;
        for (std::size_t i = 0; i < kDeferred.size(); ++i) sigaction(kDeferred.at(i), &before.at(i), nullptr);
        deferring = false;  // after the handlers, so that a passed-on signal does not return to our handler
    }
    // Without the lock, because the signal's handler may take long. A deferral that began meanwhile defers
    // the signal once more.
    for (std::size_t i = 0; i < kDeferred.size(); ++i) passOnFromOutside(i);
}

StackGuard::StackGuard() {
    if (kSanitized) return;
    const auto wanted = static_cast<std::size_t>(std::max(sysconf(_SC_SIGSTKSZ), long{kHandlerStack}));
    handlerStack_ = std::make_unique<std::byte[]>(wanted);
    stack_t stack{};
    stack.ss_sp = handlerStack_.get();
    stack.ss_size = wanted;
    if (sigaltstack(&stack, nullptr) == 0) lowest = endOfThisStack();
}

StackGuard::~StackGuard() {
    if (handlerStack_ == nullptr) return;
    lowest = 0;
    stack_t none{};
    none.ss_flags = SS_DISABLE;
    sigaltstack(&none, nullptr);
}

bool StackGuard::isBeyondStack(const void* address) noexcept {
    if (lowest == 0) return false;
    const auto at = reinterpret_cast<std::uintptr_t>(address);  // NOLINT: an address as a number
    return at >= lowest - std::min(kReach, lowest) && at < lowest;
}

}  // namespace pinwell::runtime
