// Ends a process that uses far more processor time or stack than its input can need: with one line and an
// exit status, instead of a hanging build or a crash.
//
// Every reader bounds its work, so this is for cases that the bounds miss, for example in a library.
#pragma once

#include <atomic>
#include <cstdint>
#include <string>

namespace pinwell::sandbox {

/// The limit of processor time, in seconds, for input of that many bytes: 60 s for reading (the slowest known
/// input takes 2 s), and a second for every MiB. Even a processor without hash instructions hashes ten times
/// as fast.
std::uint64_t processorSecondsFor(std::uint64_t bytes);

struct RunawayEnd {
    /// The descriptor for the line; -1 for none.
    int descriptor = 1;
    /// Lines without newlines.
    std::string processorTime;
    std::string stack;
    /// Read at the end; must live as long as the process.
    const std::atomic<std::int32_t>* exitStatus = nullptr;
};

/// From now on this process ends in this way if it has used `processorSeconds` in all, or if a thread with a
/// foundation::StackGuard exceeds its stack. The main thread's stack has at most 8 MiB. A lower limit that
/// the caller has set stays. If the time runs out during a write, the end waits for the write
/// (foundation::SignalDeferral). Call it before there is a second thread, and before the main thread's guard.
/// Other crashes are not changed; in builds with sanitizers, stacks are not limited either.
void limitRunaways(std::uint64_t processorSeconds, RunawayEnd end);

}  // namespace pinwell::sandbox
