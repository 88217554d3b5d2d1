// Failure of a builder: a step that must not fail throws, and the calling test fails.
#pragma once

#include <stdexcept>
#include <string>

namespace pinwell::test {

/// Throws std::runtime_error that names the step, unless it succeeded.
inline void require(bool success, const char* step) {
    if (!success) throw std::runtime_error(std::string("test support: ") + step);
}

}  // namespace pinwell::test
