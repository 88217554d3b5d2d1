// Replaces a file by a finished one. For this folder only.
#pragma once

#include <string>

#include "files/posix.h"

namespace pinwell::files {

/// Like FileManager::createReplacementDirectory: `.pinwell-replacement-XXXXXX` beside `item`.
Result<std::string> makeReplacementDirectory(const Place& item);

/// Like FileManager::replaceItem. `emptied` is the place of the replacement's directory.
Result<void> replaceFile(const Place& original, const Place& replacement, const Place& emptied);

}  // namespace pinwell::files
