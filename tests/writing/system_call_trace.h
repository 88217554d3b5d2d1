// A program run under ptrace(2) and stopped at one of its system calls, for something to happen there.
//
//   const TracedRun run = interruptRun(command, {.directory = volume.path()}, 17, sending(SIGKILL));
//
// The calls that count are those that touch files below one directory: by a path, or by a descriptor that
// leads there. It happens when the call has been entered and not begun: SIGKILL leaves on the disk what the
// calls before it have made, and nothing of this one.
#pragma once

#include <cstddef>
#include <functional>
#include <optional>
#include <string>

#include "support/process.h"

namespace pinwell::test {

struct TracedCalls {
    std::string directory;
    /// Count only calls that may change something on the disk. Between two of them the disk stays as it is,
    /// so that a run ended at each of them has been ended everywhere that makes a difference.
    bool changesOnly = true;
};

struct TracedRun {
    std::optional<std::string> interruptedAt;  // the call's name; nothing: the run had fewer calls
    std::optional<int> exitStatus;             // nothing when a signal ended it
    int signal = 0;
};

/// What happens; it is given the number of the process and of its thread that stands still at the call. The
/// other threads go on.
using Interruption = std::function<void(int process, int thread)>;

/// The signal comes to the thread at the call. Sent to the process, the kernel might choose another thread: a
/// traced one takes it when it gets a processor, and until then the first may reach the end of the program.
Interruption sending(int signal);

/// Runs the command (its outputs go nowhere) and interrupts it at the call of that number, counted from 0.
/// From one thread; the process must have no other children meanwhile. Throws std::system_error when the
/// program cannot be started, or not be traced.
TracedRun interruptRun(const Command& command, const TracedCalls& calls, std::size_t number,
                       const Interruption& interruption);

/// Why that cannot be done here; nothing when it can.
std::optional<std::string> tracingMissing();

}  // namespace pinwell::test
