// For test programs that inspect or forbid allocations of their code. A program that links
// `replaced_allocation` has its operator new and delete replaced, and decides about every block.
#pragma once

#include <cstddef>

namespace pinwell::test {

/// The program defines it. Every thread calls it before each allocation of that many bytes: false makes the
/// allocation fail.
bool mayAllocate(std::size_t size) noexcept;

}  // namespace pinwell::test
