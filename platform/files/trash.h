// The user's trash, as the freedesktop.org trash specification 1.0 describes it. For this folder only.
#pragma once

#include <string>

#include "files/file_manager.h"

namespace pinwell::files {

/// As FileManager::trashItem: the path that the item has in the trash.
Result<std::string> moveToTrash(const std::string& path);

}  // namespace pinwell::files
