// The state of a file, to detect whether it has changed later.
#pragma once

#include <string>

namespace pinwell::retrieval {

/// "SIZE,MODIFIED,CHANGED,INODE" of the file, without following a link; both times are SECONDS.NANOSECONDS
/// since the epoch. Empty if the file does not exist, or stat fails.
///
/// Programs cannot set the time of change. So changed contents are detected even if length and modification
/// time were restored. A file that was copied, moved to another volume or unpacked again has another state.
std::string stateOfFile(const std::string& path);

}  // namespace pinwell::retrieval
