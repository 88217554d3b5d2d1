// A child process that is killed at one of its system calls, counted from a point that it marks.
#pragma once

#include <functional>
#include <optional>
#include <string>

namespace pinwell::lumora::test {

struct KilledChild {
    bool reachedTheEnd = false;  // it made fewer calls than it took to be killed
    bool acknowledged = false;   // its action was complete, and it said so
    std::string said;            // why it failed, if it did
};

/// Why no child can be stopped at its calls here; `nullopt` if it can be.
std::optional<std::string> cannotTrace();

/// In a child: runs `prepare` undisturbed, then `act`, and kills it with SIGKILL as it enters its `call`-th
/// system call of `act`, from 1. The child acknowledges after `act` has returned.
KilledChild runAndKillAt(int call, const std::function<void()>& prepare, const std::function<void()>& act);

}  // namespace pinwell::lumora::test
