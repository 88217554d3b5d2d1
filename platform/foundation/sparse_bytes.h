// Long byte buffers that are mostly zeros, or are needed in several places.
//
// A length in a file is only a claim: a sparse file has gibibytes of zeros and uses no disk space.
// A SparseBuffer of that length takes address space, and memory only for pages with non-zero
// bytes.
#pragma once

#include <cstddef>
#include <memory>

#include "foundation/bytes.h"

namespace pinwell::foundation {

/// Unmaps the pages of a buffer.
struct Unmapping {
    std::size_t length = 0;
    void operator()(std::byte* start) const noexcept;
};

/// A buffer of fixed length, all zeros at first. Movable; a buffer that was moved from is empty.
class SparseBuffer {
  public:
    SparseBuffer() = default;

    /// Throws std::bad_alloc if there is no address space for it.
    explicit SparseBuffer(std::size_t length);

    std::size_t size() const noexcept { return start_ ? start_.get_deleter().length : 0; }
    ByteView view() const noexcept { return {start_.get(), size()}; }

    /// Copies `bytes` to `offset`, where nothing was put before. Skips whole pages of zeros. Throws
    /// std::out_of_range if the bytes do not fit.
    void put(std::size_t offset, ByteView bytes);

  private:
    std::unique_ptr<std::byte, Unmapping> start_;
};

/// Immutable bytes with a shared owner: copies and parts are cheap, and keep the whole alive.
class SharedBytes {
  public:
    SharedBytes() = default;

    // Implicit: a buffer may be passed wherever shared bytes are expected.
    SharedBytes(Data bytes);             // NOLINT(google-explicit-constructor)
    SharedBytes(SparseBuffer&& buffer);  // NOLINT(google-explicit-constructor)

    const std::byte* data() const noexcept { return view_.data(); }
    std::size_t size() const noexcept { return view_.size(); }
    bool empty() const noexcept { return view_.empty(); }
    const std::byte* begin() const noexcept { return data(); }
    const std::byte* end() const noexcept { return data() + size(); }
    ByteView view() const noexcept { return view_; }

    /// `part`, which must be a view of these bytes.
    SharedBytes share(ByteView part) const { return {owner_, part}; }

    friend bool operator==(const SharedBytes& a, ByteView b);

  private:
    SharedBytes(std::shared_ptr<const void> owner, ByteView view) : owner_(std::move(owner)), view_(view) {}

    std::shared_ptr<const void> owner_;
    ByteView view_;
};

}  // namespace pinwell::foundation
