// A program run under ptrace(2), stopped at one of its system calls, and ended there by a signal.
//
//   const TracedRun run = interruptRun(command, {.directory = volume.path()}, 17, SIGKILL);
//
// The calls that count are those that touch files below one directory: by a path, or by a descriptor that
// leads there. A signal is sent when the call has been entered and not begun: SIGKILL leaves on the disk what
// the calls before it have made, and nothing of this one.
#pragma once

#include <cstddef>
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

/// Runs the command (its outputs go nowhere) and sends the signal at the call of that number, counted from 0.
/// From one thread; the process must have no other children meanwhile. Throws std::system_error when the
/// program cannot be started, or not be traced.
TracedRun interruptRun(const Command& command, const TracedCalls& calls, std::size_t number, int signal);

/// Why that cannot be done here; nothing when it can.
std::optional<std::string> tracingMissing();

}  // namespace pinwell::test
