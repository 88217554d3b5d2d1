// Copies of regular files. For this folder only.
#pragma once

#include <string>

#include "files/file_manager.h"

namespace pinwell::files {

/// As FileManager::copyItem. Holes stay holes where the file system tells them.
Result<void> copyFile(const std::string& source, const std::string& destination);

/// As FileManager::copyContents.
Result<void> copyFileContents(const std::string& source, const std::string& destination);

}  // namespace pinwell::files
