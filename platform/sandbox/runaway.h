// The end of a process that uses far more processor time, or stack, than what it reads can be worth: one line
// and an exit status, instead of a build that hangs, or a crash.
//
// Every reader bounds its work, so this is for what a bound has missed, in a library for instance.
#pragma once

#include <atomic>
#include <cstdint>
#include <string>

namespace pinwell::sandbox {

/// Processor time, in seconds, that a run may take over input of that many bytes: 60 s for reading (what
/// takes longest of the inputs that we know takes 2 s), and a second for every MiB. A processor without any
/// instruction for it hashes more than ten times as fast.
std::uint64_t processorSecondsFor(std::uint64_t bytes);

struct RunawayEnd {
    /// Where the line goes; -1 for nowhere.
    int descriptor = 1;
    /// Lines without newlines.
    std::string processorTime;
    std::string stack;
    /// Read when it happens; must outlive the process.
    const std::atomic<std::int32_t>* exitStatus = nullptr;
};

/// From now on this process ends so, once, when it has used `processorSeconds` in all, or when a thread with
/// a foundation::StackGuard goes beyond its stack, of which the main thread's has at most 8 MiB. A lower
/// limit that the caller has set stays. Processor time that runs out while a file is written waits for the
/// end of that (foundation::SignalDeferral). To be called before there is a second thread, and before the
/// main thread's guard. Other crashes stay as they are; in builds with sanitizers, so do stacks.
void limitRunaways(std::uint64_t processorSeconds, RunawayEnd end);

}  // namespace pinwell::sandbox
