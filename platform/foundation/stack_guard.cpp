#include "foundation/stack_guard.h"

#include <pthread.h>
#include <sys/auxv.h>
#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdint>
#include <cstring>

#include "foundation/sanitized.h"

namespace pinwell::foundation {
namespace {

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

}  // namespace pinwell::foundation
