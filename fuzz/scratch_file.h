// The input in a file, for what reads files alone.
#pragma once

#include <string>

#include "foundation/file_io.h"
#include "target.h"

namespace pinwell::fuzz {

/// A regular file in memory that has no name but its descriptor's, which is a symbolic link.
class ScratchFile {
  public:
    explicit ScratchFile(ByteView contents);

    const std::string& path() const noexcept { return path_; }

  private:
    foundation::FileDescriptor file_;
    std::string path_;
};

}  // namespace pinwell::fuzz
