// A directory of a test's own, gone when the test ends.
#pragma once

#include <string>
#include <string_view>

#include "base/bytes.h"
#include "values/url.h"

namespace pinwell::test {

class TemporaryDirectory {
  public:
    TemporaryDirectory();
    ~TemporaryDirectory();
    TemporaryDirectory(const TemporaryDirectory&) = delete;
    TemporaryDirectory& operator=(const TemporaryDirectory&) = delete;

    const std::string& path() const noexcept { return path_; }
    std::string operator/(std::string_view name) const { return path_ + "/" + std::string(name); }
    values::URL url(std::string_view name) const { return values::URL::fileURLWithPath(*this / name); }

  private:
    std::string path_;
};

/// Writes a whole file, making the directories above it; throws when it cannot.
void writeFile(const std::string& path, std::string_view contents);
void writeFile(const std::string& path, base::ByteView contents);

/// The whole file; throws when it cannot be read.
std::string readFile(const std::string& path);

}  // namespace pinwell::test
