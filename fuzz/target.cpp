// Passes the input to a target, from the fuzzer or from the driver that replays inputs.
#include "target.h"

#include <fcntl.h>
#include <sys/time.h>
#include <unistd.h>

#include <csignal>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <span>

#include "src/messages.h"

namespace pinwell::fuzz {
namespace {

// Lets the fuzzer end in order after this processor time. Its own limit counts elapsed time, which is no
// measure on a busy machine.
void limitProcessorTime(long seconds) {
    struct sigaction action {};
    action.sa_handler = [](int) { raise(SIGUSR1); };
    action.sa_flags = SA_RESTART;
    sigaction(SIGPROF, &action, nullptr);
    itimerval timer{};
    timer.it_value.tv_sec = seconds;
    setitimer(ITIMER_PROF, &timer, nullptr);
}

}  // namespace

void require(bool holds, const char* claim) {
    if (holds) return;
    std::fprintf(stderr, "does not hold: %s\n", claim);
    std::abort();
}

void discardMessages() {
    static const bool done = [] {
        const int nowhere = open("/dev/null", O_WRONLY | O_CLOEXEC);
        if (nowhere < 0 || dup2(nowhere, STDOUT_FILENO) < 0) std::abort();
        close(nowhere);
        verboseLevel = kVerbosityVerbose;
        return true;
    }();
    static_cast<void>(done);
}

}  // namespace pinwell::fuzz

extern "C" int LLVMFuzzerInitialize(int*, char***);
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size);

extern "C" int LLVMFuzzerInitialize(int*, char***) {
    if (const char* seconds = std::getenv("PINWELL_FUZZ_SECONDS"))
        pinwell::fuzz::limitProcessorTime(std::strtol(seconds, nullptr, 10));
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
    pinwell::fuzz::examine(std::as_bytes(std::span(bytes, size)));
    return 0;
}
