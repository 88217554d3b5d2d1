// One writer of an item at a time. For this folder only.
#pragma once

#include <chrono>
#include <memory>
#include <string>

#include "files/file_manager.h"

namespace pinwell::files {

/// How long lockItem waits for another process: longer than any write takes, shorter than a build is left
/// hanging for.
inline constexpr std::chrono::seconds kLockPatience{60};

/// As FileManager::lockItem, with a patience of the caller's.
Result<std::unique_ptr<ItemLock>> lockPath(const std::string& path, std::chrono::milliseconds patience);

}  // namespace pinwell::files
