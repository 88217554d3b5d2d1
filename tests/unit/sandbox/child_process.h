// A child process for what cannot be undone: rights that are given up, limits that are set.
#pragma once

#include <functional>
#include <string>

namespace pinwell::test {

struct ChildEnd {
    int status = 0;    // as waitpid(2) has it
    std::string said;  // what the child wrote to its output
};

/// Runs `body` in a child, whose exit status is what it returns.
ChildEnd endOfChild(const std::function<int(int output)>& body);

}  // namespace pinwell::test
