// The user's trash, as the freedesktop.org trash specification 1.0 describes it. For this folder only.
#pragma once

#include <string>

#include "files/posix.h"

namespace pinwell::files {

/// Like FileManager::trashItem: returns the item's path in the trash.
Result<std::string> moveToTrash(const Place& place);

}  // namespace pinwell::files
