// Reads a file backwards in small steps through a moving window. So a chain of a million empty trailers costs
// a few reads for each mebibyte, instead of four calls for each trailer. The window is small at first: most
// chains are short.
#pragma once

#include <cstdint>

#include "files/file_reader.h"
#include "foundation/bytes.h"

namespace pinwell {

class TrailerWindow {
  public:
    /// Longest piece that is read through the window, in bytes.
    static constexpr std::uint64_t kSize = 64ULL * 1024;

    explicit TrailerWindow(files::FileReader& file) : file_(file) {}

    /// The `length` bytes at `offset`, at most kSize of them; fewer at the end of the file. Valid until the
    /// next call. Throws files::FileHandleError.
    foundation::ByteView readAt(std::uint64_t offset, std::uint64_t length);

  private:
    bool has(std::uint64_t offset, std::uint64_t length) const;

    files::FileReader& file_;
    foundation::Data bytes_;
    std::uint64_t next_ = 1024;  // length of the next load
    std::uint64_t start_ = 0;    // of the bytes, in the file
};

}  // namespace pinwell
