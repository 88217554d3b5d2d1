// What operator new is asked for while this lives, by the thread that made it. One at a time.
//
// Tests of bounded work hold an input's cost against numbers that are counted (allocations, reads, steps),
// never against a clock. A bound is a few times what is needed, and far below what the input claims.
#pragma once

#include <cstddef>

namespace pinwell::test {

inline constexpr std::size_t kKibibyte = 1024;
inline constexpr std::size_t kMebibyte = 1024 * kKibibyte;

class AllocationCount {
  public:
    AllocationCount();
    ~AllocationCount();
    AllocationCount(const AllocationCount&) = delete;
    AllocationCount& operator=(const AllocationCount&) = delete;

    std::size_t blocks() const;   // how many
    std::size_t bytes() const;    // all together, freed ones included
    std::size_t largest() const;  // of one block, in bytes
};

}  // namespace pinwell::test
