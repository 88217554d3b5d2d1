// Files read and written whole. For this folder only.
#pragma once

#include <string>

#include "files/file_manager.h"

namespace pinwell::files {

/// As FileManager::contentsOfFile.
Result<Data> readWholeFile(const std::string& path);

/// As FileManager::writeFile. Atomically, the new file is on stable storage before it gets its name.
Result<void> writeFileAtomically(ByteView contents, const std::string& path);
Result<void> writeFilePlainly(ByteView contents, const std::string& path);

}  // namespace pinwell::files
