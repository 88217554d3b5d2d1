// Removal of files and whole trees. For this folder only.
#pragma once

#include "files/posix.h"

namespace pinwell::files {

/// As FileManager::removeItem. Never leaves the tree, whatever is moved about in it meanwhile, and takes no
/// more open files or stack for a deep tree than for a flat one.
Result<void> removeTree(const Place& place);

}  // namespace pinwell::files
