#include "allocation_count.h"

#include <algorithm>
#include <cstdlib>
#include <new>

namespace {

struct Tally {
    bool counting = false;
    std::size_t blocks = 0;
    std::size_t bytes = 0;
    std::size_t largest = 0;
};
thread_local Tally tally;

void* allocate(std::size_t size) noexcept {
    if (tally.counting) {
        ++tally.blocks;
        tally.bytes += size;
        tally.largest = std::max(tally.largest, size);
    }
    return std::malloc(std::max<std::size_t>(size, 1));
}

void* allocateOrThrow(std::size_t size) {
    void* block = allocate(size);
    if (block == nullptr) throw std::bad_alloc();
    return block;
}

}  // namespace

void* operator new(std::size_t size) {
    return allocateOrThrow(size);
}
void* operator new[](std::size_t size) {
    return allocateOrThrow(size);
}
void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
    return allocate(size);
}
void* operator new[](std::size_t size, const std::nothrow_t&) noexcept {
    return allocate(size);
}
void operator delete(void* block) noexcept {
    std::free(block);
}
void operator delete[](void* block) noexcept {
    std::free(block);
}
void operator delete(void* block, std::size_t) noexcept {
    std::free(block);
}
void operator delete[](void* block, std::size_t) noexcept {
    std::free(block);
}
void operator delete(void* block, const std::nothrow_t&) noexcept {
    std::free(block);
}
void operator delete[](void* block, const std::nothrow_t&) noexcept {
    std::free(block);
}

namespace pinwell::test {

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
