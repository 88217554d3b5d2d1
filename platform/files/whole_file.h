// Files read and written whole. For this folder only.
#pragma once

#include "files/posix.h"

namespace pinwell::files {

/// Like FileManager::contentsOfFile.
Result<Data> readWholeFile(const Place& place);

/// Like FileManager::writeFile. With `atomic`, the new file is on stable storage before it gets its name.
Result<void> writeFileAtomically(ByteView contents, const Place& place);
Result<void> writeFilePlainly(ByteView contents, const Place& place);

}  // namespace pinwell::files
