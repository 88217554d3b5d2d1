// Putting a finished file in another's place. For this folder only.
#pragma once

#include <string>

#include "files/file_manager.h"

namespace pinwell::files {

/// As FileManager::createReplacementDirectory: `.pinwell-replacement-XXXXXX` beside `item`.
Result<std::string> makeReplacementDirectory(const std::string& item);

/// As FileManager::replaceItem.
Result<void> replaceFile(const std::string& original, const std::string& replacement);

}  // namespace pinwell::files
