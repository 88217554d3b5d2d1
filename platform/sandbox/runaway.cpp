// Ends a process that uses far more processor time or stack than its input can need.
#include <sys/resource.h>
#include <unistd.h>

#include <csignal>
#include <memory>
#include <utility>

#include "runtime/process.h"
#include "runtime/signals.h"
#include "sandbox/sandbox.h"

namespace pinwell::sandbox {
namespace {

constexpr std::uint64_t kReadingSeconds = 60;
constexpr std::uint64_t kBytesPerSecond = std::uint64_t{1024} * 1024;
constexpr std::uint64_t kSanitizedFactor = 20;  // an instrumented build may be this much slower
constexpr rlim_t kMaximumStack = rlim_t{8} * 1024 * 1024;

// A handler gets only its signal: its message must be in a global variable until the very end.
const RunawayEnd* ending = nullptr;

[[noreturn]] void endWith(const std::string& line) {
    if (ending->descriptor >= 0) {
        [[maybe_unused]] const ssize_t written = ::write(ending->descriptor, line.data(), line.size());
    }
    _exit(ending->exitStatus->load());
}

void onProcessorTime(int) {
    endWith(ending->processorTime);
}

void onFault(int number, siginfo_t* information, void*) {
    if (information->si_code > 0 && runtime::StackGuard::isBeyondStack(information->si_addr))
        endWith(ending->stack);
    // Another fault: it repeats after this returns, and the process crashes as without us.
    std::signal(number, SIG_DFL);
    if (information->si_code <= 0) raise(number);  // sent by a process, so it does not repeat by itself
}

template <class Resource>
void lower(Resource resource, rlim_t value) {
    rlimit limit{};
    if (getrlimit(resource, &limit) != 0) return;
    if (limit.rlim_cur != RLIM_INFINITY && limit.rlim_cur <= value) return;
    limit.rlim_cur = value;
    setrlimit(resource, &limit);
}

}  // namespace

std::uint64_t processorSecondsFor(std::uint64_t bytes) {
    const std::uint64_t seconds = kReadingSeconds + bytes / kBytesPerSecond;
    return runtime::kSanitized ? seconds * kSanitizedFactor : seconds;
}

void limitRunaways(std::uint64_t processorSeconds, RunawayEnd end) {
    end.processorTime += '\n';
    end.stack += '\n';
    ending = std::make_unique<RunawayEnd>(std::move(end)).release();

    struct sigaction action {};
    sigfillset(&action.sa_mask);
    action.sa_handler = onProcessorTime;
    sigaction(SIGXCPU, &action, nullptr);
    lower(RLIMIT_CPU, processorSeconds);

    if (runtime::kSanitized) return;
    lower(RLIMIT_STACK, kMaximumStack);
    action.sa_sigaction = onFault;
    action.sa_flags = SA_SIGINFO | SA_ONSTACK;
    sigaction(SIGSEGV, &action, nullptr);
}

}  // namespace pinwell::sandbox
