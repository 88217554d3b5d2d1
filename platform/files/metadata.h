// The metadata of a file: owner, mode, extended attributes, access control list, times. For this folder
// only.
#pragma once

#include "files/posix.h"

namespace pinwell::files {

/// Copies the current owner, mode, extended attributes and access control list of `from` to `to`. Skips
/// metadata that the process may not set (owner, attributes outside the user's own) or the volume cannot
/// store; skipping never gives anybody more rights. Set-ID bits are copied only with the owner.
Result<void> carryMetadata(const OpenFile& from, const OpenFile& to);

/// Sets the access and modification times of `to` to those of `from` when it was opened.
Result<void> carryTimes(const OpenFile& from, const OpenFile& to);

}  // namespace pinwell::files
