// A file in memory, for parsers.
#pragma once

#include <algorithm>
#include <cstdint>
#include <limits>
#include <utility>

#include "files/file_reader.h"

namespace pinwell::test {

/// Reads its bytes like an open file. Reads that touch the byte at `broken` fail.
class MemoryReader : public files::FileReader {
  public:
    static constexpr std::uint64_t kNowhere = std::numeric_limits<std::uint64_t>::max();

    explicit MemoryReader(base::Data bytes, std::uint64_t broken = kNowhere)
        : bytes_(std::move(bytes)), broken_(broken) {}

    std::uint64_t seekToEnd() override { return position_ = bytes_.size(); }
    std::uint64_t seek(std::uint64_t position) override { return position_ = position; }
    std::uint64_t position() override { return position_; }
    base::Data read(std::uint64_t length) override {
        const std::uint64_t begin = std::min<std::uint64_t>(position_, bytes_.size());
        const std::uint64_t end = begin + std::min<std::uint64_t>(length, bytes_.size() - begin);
        if (broken_ >= begin && broken_ < end) throw files::FileHandleError("a broken sector");
        position_ = end;
        return base::toData(base::ByteView(bytes_).subspan(begin, end - begin));
    }

  private:
    base::Data bytes_;
    std::uint64_t broken_;
    std::uint64_t position_ = 0;
};

}  // namespace pinwell::test
