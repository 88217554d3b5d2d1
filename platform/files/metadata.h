// What a file carries besides its contents: owner, mode, extended attributes, access control list, times.
// For this folder only.
#pragma once

#include "files/posix.h"

namespace pinwell::files {

/// Gives `to` the owner, mode, extended attributes and access control list that `from` has now. Left out is
/// what the process may not give (owner, attributes outside the user's own) or the volume cannot keep;
/// nothing that is left out gives anybody more rights than they had. Set-ID bits go only with their owner.
Result<void> carryMetadata(const OpenFile& from, const OpenFile& to);

/// Gives `to` the times of access and modification that `from` had when it was opened.
Result<void> carryTimes(const OpenFile& from, const OpenFile& to);

}  // namespace pinwell::files
