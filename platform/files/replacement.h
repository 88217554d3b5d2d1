// Putting a finished file in another's place. For this folder only.
#pragma once

#include <string>

#include "files/posix.h"

namespace pinwell::files {

/// As FileManager::createReplacementDirectory: `.pinwell-replacement-XXXXXX` beside `item`.
Result<std::string> makeReplacementDirectory(const Place& item);

/// As FileManager::replaceItem. `emptied` is the place of the directory that the replacement stands in.
Result<void> replaceFile(const Place& original, const Place& replacement, const Place& emptied);

}  // namespace pinwell::files
