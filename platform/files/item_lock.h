// One writer of an item at a time. For this folder only.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "files/posix.h"

namespace pinwell::files {

/// How long lockItem waits for another process: longer than any write takes, and short enough for a build to
/// wait.
inline constexpr std::chrono::seconds kLockPatience{60};

/// Like FileManager::lockItem, with the caller's own time limit. The path is resolved through `places`.
Result<std::unique_ptr<ItemLock>> lockPath(const Places& places, const std::string& path,
                                           std::chrono::milliseconds patience,
                                           const std::function<void()>& waiting);

/// Whether locks on a file system of that type (statfs(2)) block other readers and writers: on CIFS and SMB,
/// flock(2) becomes a lock that the server enforces.
bool hasMandatoryLocks(std::int64_t fileSystemType);

}  // namespace pinwell::files
