// What tells a file as it was from what is at the same path later.
#pragma once

#include <string>

namespace pinwell::retrieval {

/// "SIZE,MODIFIED,CHANGED,INODE" of the file itself, whose link is not followed; both times are
/// SECONDS.NANOSECONDS since the epoch. Empty if there is no such file, or it cannot be asked.
///
/// Nobody can set the time of change: other contents show even if length and modification time were put back.
/// A file that was copied, moved to another volume or unpacked again is another one.
std::string stateOfFile(const std::string& path);

}  // namespace pinwell::retrieval
