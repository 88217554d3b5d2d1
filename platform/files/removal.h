// Removal of files and whole trees. For this folder only.
#pragma once

#include "files/posix.h"

namespace pinwell::files {

/// Like FileManager::removeItem. Never leaves the tree, even if others move items in it meanwhile. Needs no
/// more open files or stack for a deep tree than for a flat one.
Result<void> removeTree(const Place& place);

}  // namespace pinwell::files
