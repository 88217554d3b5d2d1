// Clones: copies that share their blocks with the original until one of them is written (reflinks, see
// ioctl_ficlonerange(2)). For this folder only.
#pragma once

#include "files/posix.h"

namespace pinwell::files {

/// Whether the file system can clone the file at `place`. Requests an operation that must fail: sharing the
/// file's beginning with itself. The error code gives the result. Changes nothing, and usually creates
/// nothing. Returns an error if the probe itself fails.
Result<bool> fileSupportsCloning(const Place& place);

/// Makes the empty file `to` a clone of `from`. Returns false, without any change, if that is not possible.
bool cloneFile(const OpenFile& from, const OpenFile& to);

}  // namespace pinwell::files
