// A directory of a test's own, gone when the test ends.
#pragma once

#include <string>
#include <string_view>

#include "foundation/bytes.h"
#include "foundation/url.h"

namespace pinwell::test {

class TemporaryDirectory {
  public:
    TemporaryDirectory();
    ~TemporaryDirectory();
    TemporaryDirectory(const TemporaryDirectory&) = delete;
    TemporaryDirectory& operator=(const TemporaryDirectory&) = delete;

    const std::string& path() const noexcept { return path_; }
    std::string operator/(std::string_view name) const { return path_ + "/" + std::string(name); }
    foundation::URL url(std::string_view name) const {
        return foundation::URL::fileURLWithPath(*this / name);
    }

  private:
    std::string path_;
};

/// Writes a whole file, making the directories above it; throws when it cannot.
void writeFile(const std::string& path, std::string_view contents);
void writeFile(const std::string& path, foundation::ByteView contents);

/// The whole file; throws when it cannot be read.
std::string readFile(const std::string& path);

}  // namespace pinwell::test
