// Clones: copies that share their blocks with the original until one of the two is written (reflinks, see
// ioctl_ficlonerange(2)). For this folder only.
#pragma once

#include "files/posix.h"

namespace pinwell::files {

/// Whether the file system can clone the file at `path`, found by cloning the beginning of it into a file
/// without a name, beside it. The file is only read.
Result<bool> fileSupportsCloning(const std::string& path);

/// Makes the empty file `to` a clone of `from`. NO, with nothing lost but the attempt, when that cannot be.
bool cloneFile(const OpenFile& from, const OpenFile& to);

}  // namespace pinwell::files
