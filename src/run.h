// A run of the tool, from its operation and its path to its exit status.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>

#include "foundation/url.h"
#include "src/platform.h"

namespace pinwell {

/// Takes the lock of an artefact that is about to be stapled into `lock`, and waits for it, which the verbose
/// output says. To be called when the kind is known and nothing has been read
/// (PWHashedFile::BeforeReading). Returns false, and says so, only if another process holds it. Without a
/// lock (the file system knows none, or its locks would block others) the run goes on: every write checks the
/// file's state again.
bool lockArtefact(const Platform& platform, const foundation::URL& path,
                  std::unique_ptr<files::ItemLock>& lock);

/// The exit status of a run that started nothing and recorded no other.
inline constexpr int kExitNothingRecorded = 1;

/// Staples (kOperationStaple) or validates the artefact at `path`, and answers the exit status.
///
/// A run that gets as far as the network is ended by its controller, from another thread, through the
/// platform's exitProcess. `waitForEnd` is where this thread spends the time until then; should it ever
/// return, the status is 0.
int runOperation(std::uint8_t operation, const foundation::URL& path, const Platform& platform,
                 const std::function<void()>& waitForEnd);

}  // namespace pinwell
