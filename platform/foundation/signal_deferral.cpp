#include "foundation/signal_deferral.h"

#include <unistd.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <csignal>
#include <cstddef>
#include <mutex>

namespace pinwell::foundation {
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

}  // namespace pinwell::foundation
