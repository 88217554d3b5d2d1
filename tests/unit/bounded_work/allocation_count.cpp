#include "allocation_count.h"

#include <algorithm>

#include "support/replaced_allocation.h"

namespace {

struct Tally {
    bool counting = false;
    std::size_t blocks = 0;
    std::size_t bytes = 0;
    std::size_t largest = 0;
};
thread_local Tally tally;

}  // namespace

namespace pinwell::test {

bool mayAllocate(std::size_t size) noexcept {
    if (tally.counting) {
        ++tally.blocks;
        tally.bytes += size;
        tally.largest = std::max(tally.largest, size);
    }
    return true;
}

AllocationCount::AllocationCount() {
    tally = {.counting = true};
}
AllocationCount::~AllocationCount() {
    tally.counting = false;
}
std::size_t AllocationCount::blocks() const {
    return tally.blocks;
}
std::size_t AllocationCount::bytes() const {
    return tally.bytes;
}
std::size_t AllocationCount::largest() const {
    return tally.largest;
}

}  // namespace pinwell::test
