// Opens paths only below a directory. The directory's owner may move its contents, or replace them by links,
// while they are read.
#pragma once

#include <sys/types.h>

#include <string>

#include "foundation/file_io.h"

namespace pinwell::foundation {

/// Opens `path`, which is relative, below the directory `root`, as openat(2) does with `flags` and `mode`.
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

}  // namespace pinwell::foundation
