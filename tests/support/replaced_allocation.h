// For test programs that look into, or forbid, what their code allocates: one that links
// `replaced_allocation` has its operator new and delete replaced, and is asked about every block.
#pragma once

#include <cstddef>

namespace pinwell::test {

/// To be defined by the program, and called by every thread of it before a block of that many bytes is made:
/// false where there shall be no memory.
bool mayAllocate(std::size_t size) noexcept;

}  // namespace pinwell::test
