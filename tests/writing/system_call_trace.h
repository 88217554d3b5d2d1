// A program run under ptrace(2) and stopped at one of its system calls, where the test acts.
//
//   const TracedRun run = interruptRun(command, {.directory = volume.path()}, 17, sending(SIGKILL));
//
// Only calls on files below one directory count: by a path, or by a descriptor below it. The program stops
// after it has entered the call and before the call begins. So SIGKILL leaves the results of the earlier
// calls on the disk, and nothing of this one.
#pragma once

#include <cstddef>
#include <functional>
#include <optional>
#include <string>

#include "support/process.h"

namespace pinwell::test {

struct TracedCalls {
    std::string directory;
    /// Count only calls that may change the disk. Between two of them the disk stays the same, so ending a
    /// run at each of them covers every different state.
    bool changesOnly = true;
};

struct TracedRun {
    std::optional<std::string> interruptedAt;  // the call's name; `nullopt`: the run had fewer calls
    std::optional<int> exitStatus;             // `nullopt` if a signal ended it
    int signal = 0;
};

/// Acts on the stopped program. The arguments are its process and the thread at the call. The other threads
/// continue.
using Interruption = std::function<void(int process, int thread)>;

/// The signal is sent to the thread at the call. For a signal to the process, the kernel may choose another
/// thread. That one takes it when it gets a processor, perhaps after the first has ended the program.
Interruption sending(int signal);

/// Runs the command (its outputs are dropped) and interrupts it at the call of that number, counted from 0.
/// From one thread; the process must have no other children during it. Throws std::system_error if the
/// program cannot be started or traced.
TracedRun interruptRun(const Command& command, const TracedCalls& calls, std::size_t number,
                       const Interruption& interruption);

/// Why tracing is impossible here; `nullopt` if it is possible.
std::optional<std::string> tracingMissing();

}  // namespace pinwell::test
