// The operations of the local file manager, each on places instead of URLs. For this folder only.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "posix.h"

namespace pinwell::files {

/// Whether the file system can clone the file at `place`. Requests an operation that must fail: sharing the
/// file's beginning with itself. The error code gives the result. Changes nothing, and usually creates
/// nothing. Returns an error if the probe itself fails.
Result<bool> fileSupportsCloning(const Place& place);

/// Like FileManager::copyItem. Holes stay holes if the file system reports them.
Result<void> copyFile(const Place& source, const Place& destination);

/// Like FileManager::copyContents.
Result<void> copyFileContents(const Place& source, const Place& destination);

/// Copies the current owner, mode, extended attributes and access control list of `from` to `to`. Skips
/// metadata that the process may not set (owner, attributes outside the user's own) or the volume cannot
/// store; skipping never gives anybody more rights. Set-ID bits are copied only with the owner.
Result<void> carryMetadata(const OpenFile& from, const OpenFile& to);

/// Sets the access and modification times of `to` to those of `from` when it was opened.
Result<void> carryTimes(const OpenFile& from, const OpenFile& to);

/// Like FileManager::contentsOfFile.
Result<Data> readWholeFile(const Place& place);

/// Like FileManager::writeFile. With `atomic`, the new file is on stable storage before it gets its name.
Result<void> writeFileAtomically(ByteView contents, const Place& place);
Result<void> writeFilePlainly(ByteView contents, const Place& place);

/// Like FileManager::createReplacementDirectory: `.pinwell-replacement-XXXXXX` beside `item`.
Result<std::string> makeReplacementDirectory(const Place& item);

/// Like FileManager::replaceItem. `emptied` is the place of the replacement's directory.
Result<void> replaceFile(const Place& original, const Place& replacement, const Place& emptied);

/// Like FileManager::removeItem. Never leaves the tree, even if others move items in it meanwhile. Needs no
/// more open files or stack for a deep tree than for a flat one.
Result<void> removeTree(const Place& place);

/// Like FileManager::trashItem: returns the item's path in the user's trash (freedesktop.org trash
/// specification 1.0).
Result<std::string> moveToTrash(const Place& place);

/// A handle on the regular file at `place`; `access` is O_RDONLY or O_RDWR.
Result<std::unique_ptr<FileHandle>> openFileHandle(const Place& place, int access);

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
