// Copies of regular files. For this folder only.
#pragma once

#include "files/posix.h"

namespace pinwell::files {

/// Like FileManager::copyItem. Holes stay holes if the file system reports them.
Result<void> copyFile(const Place& source, const Place& destination);

/// Like FileManager::copyContents.
Result<void> copyFileContents(const Place& source, const Place& destination);

}  // namespace pinwell::files
