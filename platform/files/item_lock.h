// One writer of an item at a time. For this folder only.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "files/posix.h"

namespace pinwell::files {

/// How long lockItem waits for another process: longer than any write takes, shorter than a build is left
/// hanging for.
inline constexpr std::chrono::seconds kLockPatience{60};

/// As FileManager::lockItem, with a patience of the caller's. The path is looked up in `places`.
Result<std::unique_ptr<ItemLock>> lockPath(const Places& places, const std::string& path,
                                           std::chrono::milliseconds patience,
                                           const std::function<void()>& waiting);

/// Whether locks on a file system of that type (statfs(2)) keep others from reading and writing: on CIFS and
/// SMB, flock(2) becomes a lock that the server enforces.
bool hasMandatoryLocks(std::int64_t fileSystemType);

}  // namespace pinwell::files
