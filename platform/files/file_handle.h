// File handles. For this folder only.
#pragma once

#include <memory>
#include <string>

#include "files/file_manager.h"

namespace pinwell::files {

/// A handle on the regular file at `path`; `access` is O_RDONLY or O_RDWR.
Result<std::unique_ptr<FileHandle>> openFileHandle(const std::string& path, int access);

}  // namespace pinwell::files
