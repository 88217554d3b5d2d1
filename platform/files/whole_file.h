// Files read and written whole. For this folder only.
#pragma once

#include "files/posix.h"

namespace pinwell::files {

/// As FileManager::contentsOfFile.
Result<Data> readWholeFile(const Place& place);

/// As FileManager::writeFile. Atomically, the new file is on stable storage before it gets its name.
Result<void> writeFileAtomically(ByteView contents, const Place& place);
Result<void> writeFilePlainly(ByteView contents, const Place& place);

}  // namespace pinwell::files
