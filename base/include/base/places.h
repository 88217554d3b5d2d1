// The places of items: a name in an open directory, instead of a path that may lead elsewhere at every call.
//
//   const Anchor held = places.hold("/Applications/Tool.app");
//   places.find("/Applications/Tool.app/Contents/CodeResources")
//
// While a directory is held, all paths below it are resolved from the first opened descriptor, and
// links that lead out of it are not followed (openBeneath). While any other item is held, the same is
// true for its own name and its siblings' names in its directory. The kernel resolves all other
// paths.
#pragma once

#include <sys/stat.h>
#include <sys/types.h>

#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "base/error.h"
#include "base/file_io.h"
#include "base/handle.h"

namespace pinwell::base {

/// One item, by its name in a directory that is held open. Copies share the directory.
struct Place {
    std::shared_ptr<const FileDescriptor> parent;  // opened with O_PATH
    std::string name;                              // a single component; "." for a held directory itself
    std::string path;                              // the caller's path, for errors

    int directory() const noexcept { return parent->get(); }

    /// Status of the item itself, without following a link.
    Result<struct stat> status() const;

    /// The item itself, without following a link (ELOOP); close-on-exec. `flags` as for open(2).
    Result<FileDescriptor> open(int flags, mode_t mode = 0) const;

    /// The item itself if it is a regular file, as openRegularFile() opens it; without following a link.
    Result<RegularFile> openRegularFile(int flags, mode_t mode = 0) const;
};

/// A directory kept open.
class HeldPlace {
  public:
    /// `item` is the requested path. If `isTree`, all paths below the directory are resolved from it;
    /// otherwise only its own entries.
    HeldPlace(std::string item, std::string directory, bool isTree, FileDescriptor descriptor)
        : item_(std::move(item)),
          directory_(std::move(directory)),
          isTree_(isTree),
          descriptor_(std::make_shared<FileDescriptor>(std::move(descriptor))) {}

    const std::string& item() const noexcept { return item_; }
    const std::string& directory() const noexcept { return directory_; }
    bool isTree() const noexcept { return isTree_; }
    const std::shared_ptr<const FileDescriptor>& descriptor() const noexcept { return descriptor_; }

    /// The part of `path` below the directory, empty for the directory itself; `nullopt` if the path is not
    /// resolved from here.
    std::optional<std::string> relative(const std::string& path) const;

    /// Opens `relative`, following links that stay below (openBeneath). Errors name the whole path.
    Result<FileDescriptor> open(const std::string& relative, int flags) const;

  private:
    std::string item_;
    std::string directory_;
    bool isTree_;
    std::shared_ptr<const FileDescriptor> descriptor_;
};

/// Holds an item's directory for as long as it, or a copy of it, lives.
using Anchor = std::shared_ptr<const HeldPlace>;

/// May be used from any thread.
class Places {
  public:
    Places() = default;
    Places(const Places&) = delete;
    Places& operator=(const Places&) = delete;

    /// Holds the item at the absolute `path`: a directory itself, or the directory of any other item. A path
    /// that is already held keeps its descriptor, even if the name now leads elsewhere. An error comes from
    /// the lookup.
    Result<Anchor> hold(const std::string& path);

    /// Returns EXDEV if the path goes through a link that leads out of a held directory.
    Result<Place> find(const std::string& path) const;

  private:
    std::vector<Anchor> held() const;

    mutable std::mutex mutex_;
    mutable std::vector<std::weak_ptr<const HeldPlace>> held_;
};

/// Opens `path`, which is relative, below the directory `root`, as openat(2) does with `flags` and `mode`.
/// The directory's owner may move its contents, or replace them by links, while they are read.
///
/// O_CLOEXEC is added. Symbolic links on the way are followed if they stay below; the last component's too
/// unless `flags` has O_NOFOLLOW. A path that leads out of the directory (an absolute link, or ".." above it)
/// is refused with EXDEV. An empty path, or ".", is the directory itself.
///
/// Returns a descriptor; an empty one, with errno set, on failure. Uses openat2(2), and
/// openBeneathByWalking() on kernels without it (before Linux 5.6) and in sandboxes that do not know it.
FileDescriptor openBeneath(int root, const std::string& path, int flags, mode_t mode = 0);

/// The same by one openat(2) for each component. If a directory is moved out while the walk is in it, ".."
/// still returns to the directory that the walk came from.
FileDescriptor openBeneathByWalking(int root, const std::string& path, int flags, mode_t mode = 0);

}  // namespace pinwell::base
