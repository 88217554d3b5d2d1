// Separate volumes for tests that depend on the file system.
#pragma once

#include <optional>
#include <string>

#include "support/temporary_directory.h"

namespace pinwell::test {

/// A fresh volume, mounted only for this process, and removed at the end of the process at the latest. Throws
/// if ctest runs the test as one of another kind than "volume" (PINWELL_TEST_KIND in the environment).
class Volume {
  public:
    /// `fileSystem` gives the command to make it: "xfs", "xfs -m reflink=0", "btrfs", "ext4", or "tmpfs" of
    /// one MiB.
    explicit Volume(const std::string& fileSystem);
    ~Volume();
    Volume(const Volume&) = delete;
    Volume& operator=(const Volume&) = delete;

    /// Why there is none: no rights, no loop device, no such file system here.
    const std::optional<std::string>& missing() const noexcept { return missing_; }

    std::string operator/(std::string_view name) const { return path_ + "/" + std::string(name); }
    const std::string& path() const noexcept { return path_; }

  private:
    TemporaryDirectory directory_;
    std::string path_;
    std::optional<std::string> missing_;
};

}  // namespace pinwell::test
