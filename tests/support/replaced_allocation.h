// For test programs that look into, or forbid, what their code allocates: one that links
// `replaced_allocation` has its operator new and delete replaced, and says itself where blocks come from.
#pragma once

#include <cstddef>

namespace pinwell::test {

/// To be defined by the program, and called by every thread of it: a block from malloc, or null where there
/// shall be no memory. `size` may be 0, and the block is one of its own even then.
void* allocateBlock(std::size_t size) noexcept;

}  // namespace pinwell::test
