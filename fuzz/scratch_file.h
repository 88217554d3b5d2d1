// The input as a file, for code that reads only files.
#pragma once

#include <string>

#include "base/handle.h"
#include "target.h"

namespace pinwell::fuzz {

/// A regular file in memory. Its only name is a symbolic link, the one of its descriptor.
class ScratchFile {
  public:
    explicit ScratchFile(ByteView contents);

    const std::string& path() const noexcept { return path_; }

  private:
    base::FileDescriptor file_;
    std::string path_;
};

}  // namespace pinwell::fuzz
