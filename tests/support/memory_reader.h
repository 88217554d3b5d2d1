// A file in memory with a broken sector, for parsers.
#pragma once

#include <algorithm>
#include <cstdint>
#include <limits>
#include <span>
#include <utility>

#include "base/byte_source.h"

namespace pinwell::test {

/// Reads its bytes like an open file. Reads that touch the byte at `broken` fail.
class MemoryReader : public base::ByteSource {
  public:
    static constexpr std::uint64_t kNowhere = std::numeric_limits<std::uint64_t>::max();

    explicit MemoryReader(base::Data bytes, std::uint64_t broken = kNowhere)
        : bytes_(std::move(bytes)), broken_(broken) {}

    std::uint64_t size() const override { return bytes_.size(); }
    std::size_t readAt(std::uint64_t offset, std::span<std::byte> buffer) const override {
        const std::size_t count = bytes_.readAt(offset, buffer);
        if (broken_ >= offset && broken_ - offset < count)
            throw base::ReadFailure(base::ReadFailure::Kind::unreadable, "a broken sector", broken_);
        return count;
    }

  private:
    base::MemorySource bytes_;
    std::uint64_t broken_;
};

}  // namespace pinwell::test
