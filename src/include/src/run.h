// A run of the tool, from its operation and its path to its exit status.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>

#include "src/platform.h"
#include "values/url.h"

namespace pinwell {

/// Locks an artefact before it is stapled, and puts the lock into `lock`. Waits for the lock; the verbose
/// output says so. Call it when the kind is known and before anything is read
/// (PWHashedFile::BeforeReading). Returns false, with a message, only if another process holds the lock.
/// Without a lock (the file system has none, or its locks would block others) the run goes on: every write
/// checks the file's state again.
bool lockArtefact(const Platform& platform, const values::URL& path, std::unique_ptr<files::ItemLock>& lock);

/// The exit status of a run that started nothing and recorded no other.
inline constexpr int kExitNothingRecorded = 1;

/// Staples (kOperationStaple) or validates the artefact at `path`, and returns the exit status.
///
/// The controller ends a run that reaches the network, from another thread, through the
/// platform's exitProcess. This thread waits in `waitForEnd` until then; if that returns, the
/// status is 0.
int runOperation(std::uint8_t operation, const values::URL& path, const Platform& platform,
                 const std::function<void()>& waitForEnd);

}  // namespace pinwell
