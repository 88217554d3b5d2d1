#include "base/bytes.h"

#include <sys/mman.h>

#include <algorithm>
#include <cstring>
#include <new>
#include <stdexcept>
#include <utility>

namespace pinwell::base {
namespace {

/// The usual page size; on a system with larger pages only the saving is smaller.
constexpr std::size_t kPage = 4096;

bool isZero(ByteView bytes) {
    return bytes.front() == std::byte{} && std::memcmp(bytes.data(), bytes.data() + 1, bytes.size() - 1) == 0;
}

}  // namespace

void Unmapping::operator()(std::byte* start) const noexcept {
    munmap(start, length);
}

SparseBuffer::SparseBuffer(std::size_t length) {
    if (length == 0) return;
    void* const start =
        mmap(nullptr, length, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
    if (start == MAP_FAILED) throw std::bad_alloc();
    // A huge page would take 2 MiB for the first byte in it. Only advice: without it the buffer works too.
    static_cast<void>(madvise(start, length, MADV_NOHUGEPAGE));
    start_ = {static_cast<std::byte*>(start), Unmapping{length}};
}

void SparseBuffer::put(std::size_t offset, ByteView bytes) {
    if (offset > size() || bytes.size() > size() - offset)
        throw std::out_of_range("more bytes than the buffer has room for");
    while (!bytes.empty()) {
        const ByteView page = bytes.first(std::min(bytes.size(), kPage - offset % kPage));
        if (!isZero(page)) std::memcpy(start_.get() + offset, page.data(), page.size());
        offset += page.size();
        bytes = bytes.subspan(page.size());
    }
}

SharedBytes::SharedBytes(Data bytes) {
    auto owner = std::make_shared<const Data>(std::move(bytes));
    view_ = *owner;
    owner_ = std::move(owner);
}

SharedBytes::SharedBytes(SparseBuffer&& buffer) {
    auto owner = std::make_shared<const SparseBuffer>(std::move(buffer));
    view_ = owner->view();
    owner_ = std::move(owner);
}

bool operator==(const SharedBytes& a, ByteView b) {
    return std::ranges::equal(a.view_, b);
}

}  // namespace pinwell::base
