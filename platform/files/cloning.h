// Clones: copies that share their blocks with the original until one of the two is written (reflinks, see
// ioctl_ficlonerange(2)). For this folder only.
#pragma once

#include "files/posix.h"

namespace pinwell::files {

/// Whether the file system can clone the file at `place`, found by asking for something that it can only
/// refuse: to share the file's own beginning with itself. Nothing is changed, and as a rule nothing is made.
/// An error is a question that could not be put.
Result<bool> fileSupportsCloning(const Place& place);

/// Makes the empty file `to` a clone of `from`. NO, with nothing lost but the attempt, when that cannot be.
bool cloneFile(const OpenFile& from, const OpenFile& to);

}  // namespace pinwell::files
