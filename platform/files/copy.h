// Copies of regular files. For this folder only.
#pragma once

#include "files/posix.h"

namespace pinwell::files {

/// As FileManager::copyItem. Holes stay holes where the file system tells them.
Result<void> copyFile(const Place& source, const Place& destination);

/// As FileManager::copyContents.
Result<void> copyFileContents(const Place& source, const Place& destination);

}  // namespace pinwell::files
