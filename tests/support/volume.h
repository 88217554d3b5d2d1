// Volumes of a test's own, for what depends on the file system.
#pragma once

#include <optional>
#include <string>

#include "support/temporary_directory.h"

namespace pinwell::test {

/// A fresh volume, mounted where only this process sees it, and gone with it at the latest.
class Volume {
  public:
    /// `fileSystem` is how it is made: "xfs", "xfs -m reflink=0", "btrfs", "ext4", or "tmpfs" of one
    /// MiB.
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
