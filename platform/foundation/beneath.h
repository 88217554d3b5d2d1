// Opening what is below a directory, and nothing else: the directory may belong to somebody who moves its
// contents about, or puts links in their place, while they are looked at.
#pragma once

#include <sys/types.h>

#include <string>

#include "foundation/file_io.h"

namespace pinwell::foundation {

/// Opens `path`, which is relative, below the directory `root`, as openat(2) does with `flags` and `mode`.
/// O_CLOEXEC is added. Symbolic links on the way are followed as long as they stay below; the last
/// component's too unless `flags` has O_NOFOLLOW. What leads out of the directory (an absolute link, or ".."
/// above it) is refused with EXDEV. An empty path, or ".", is the directory itself.
///
/// Returns a descriptor; none, with errno set, when that fails. Uses openat2(2), and openBeneathByWalking()
/// on kernels without it (before Linux 5.6) and in sandboxes that do not know it.
FileDescriptor openBeneath(int root, const std::string& path, int flags, mode_t mode = 0);

/// The same by one openat(2) a component. A directory that is moved out while the walk is in it stays the one
/// that was below: ".." goes back to where the walk came from.
FileDescriptor openBeneathByWalking(int root, const std::string& path, int flags, mode_t mode = 0);

}  // namespace pinwell::foundation
