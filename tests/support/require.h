// The builders' way to give up: a step that must not fail throws, and the test that asked for it fails.
#pragma once

#include <stdexcept>
#include <string>

namespace pinwell::test {

/// Throws std::runtime_error that names the step, unless it succeeded.
inline void require(bool success, const char* step) {
    if (!success) throw std::runtime_error(std::string("test support: ") + step);
}

}  // namespace pinwell::test
