// Counts the requests to operator new during its life, by the thread that made it. One at a time.
//
// Tests of bounded work compare an input's cost with counted numbers (allocations, reads, steps), never with
// a clock. A bound is a few times the necessary work, and far below the input's claim.
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

    std::size_t blocks() const;   // the number of requests
    std::size_t bytes() const;    // all together, freed ones included
    std::size_t largest() const;  // of one block, in bytes
};

}  // namespace pinwell::test
