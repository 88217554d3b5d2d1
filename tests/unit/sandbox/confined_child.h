// A child process that gives up rights and then attempts an action. Confinement is irreversible, so no test
// may confine the test program itself.
#pragma once

#include <functional>
#include <optional>
#include <string>

#include "sandbox/sandbox.h"

namespace pinwell::test {

/// The attempted action. Returns 0, or the errno value of the failure; at most 200.
using Attempt = std::function<int()>;

/// The result of `attempt` in a child that is confined first. Fails the test when the child dies or when a
/// facility is not in force.
int whenConfined(const sandbox::Confinement& confinement, const Attempt& attempt);

/// The facilities that are taken from the child before it is confined, as by a kernel without them.
enum class Missing { landlock, seccomp };

struct Outcome {
    std::string said;  // the result of confine(), a line each
    int result = 0;    // of the attempt
};
Outcome whenConfinedWithout(Missing missing, const sandbox::Confinement& confinement, const Attempt& attempt);

/// 0 for a call's success, else errno.
inline int reasonOf(long result) {
    return result < 0 ? errno : 0;
}

/// Why this build or this kernel cannot be tested; `nullopt` if it can.
std::optional<std::string> confinementMissing();

}  // namespace pinwell::test
