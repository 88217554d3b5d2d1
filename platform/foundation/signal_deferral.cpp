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

// A handler is given nothing but its signal's number: what it leaves, and what shall be put back when it has
// done, has to stand where it can find it.
std::array<std::atomic<bool>, kDeferred.size()> arrived;
static_assert(std::atomic<bool>::is_always_lock_free, "a signal handler may touch nothing else");
std::array<struct sigaction, kDeferred.size()> before;

// Of several deferrals the first one puts off, and the last one lets through.
std::mutex mutex;
std::size_t alive = 0;

// Whether a deferral is alive, for the handler, which may not wait for the mutex.
std::atomic<bool> deferring = false;

// This thread takes the signal, before it goes on: of a process with several, kill(2) may choose another one,
// and that one may come too late.
void passOn(std::size_t i) {
    if (arrived.at(i).exchange(false)) raise(kDeferred.at(i));
}

// What this thread blocks is for others to take.
void passOnFromOutside(std::size_t i) {
    sigset_t blocked;
    pthread_sigmask(SIG_BLOCK, nullptr, &blocked);
    if (sigismember(&blocked, kDeferred.at(i)) == 0) return passOn(i);
    if (arrived.at(i).exchange(false)) kill(getpid(), kDeferred.at(i));
}

// The kernel may have chosen this handler for a thread that runs it only after the deferral has ended and has
// looked for the last time. So the handler sets its flag and then looks whether anybody will read it; the
// deferral says that it has ended and then reads the flags. Whichever comes second sees what the other has
// written.
void note(int number) {
    const int error = errno;
    for (std::size_t i = 0; i < kDeferred.size(); ++i) {
        if (kDeferred.at(i) != number) continue;
        arrived.at(i) = true;
        if (!deferring) passOn(i);  // it comes when the handler returns
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
    noting.sa_flags = SA_RESTART;  // nothing is to notice
    sigemptyset(&noting.sa_mask);
    for (std::size_t i = 0; i < kDeferred.size(); ++i) {
        sigaction(kDeferred.at(i), nullptr, &before.at(i));
        // Ignored from the start, by nohup(1) for instance: it is the caller's wish.
        if (before.at(i).sa_handler != SIG_IGN) sigaction(kDeferred.at(i), &noting, nullptr);
    }
}

SignalDeferral::~SignalDeferral() {
    {
        const std::lock_guard lock(mutex);
        if (--alive > 0) return;
        for (std::size_t i = 0; i < kDeferred.size(); ++i) sigaction(kDeferred.at(i), &before.at(i), nullptr);
        deferring = false;  // after the handlers, so that what the handler passes on does not come back to it
    }
    // Without the lock: what the signal starts may take its time. A deferral that began meanwhile puts the
    // signal off once more.
    for (std::size_t i = 0; i < kDeferred.size(); ++i) passOnFromOutside(i);
}

}  // namespace pinwell::foundation
