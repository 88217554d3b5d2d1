// A child process for irreversible actions: giving up rights, setting limits.
#pragma once

#include <functional>
#include <string>

namespace pinwell::test {

struct ChildEnd {
    int status = 0;    // as waitpid(2) has it
    std::string said;  // the child's output
};

/// Runs `body` in a child; its result is the exit status.
ChildEnd endOfChild(const std::function<int(int output)>& body);

}  // namespace pinwell::test
