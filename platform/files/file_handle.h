// File handles. For this folder only.
#pragma once

#include <memory>

#include "files/posix.h"

namespace pinwell::files {

/// A handle on the regular file at `place`; `access` is O_RDONLY or O_RDWR.
Result<std::unique_ptr<FileHandle>> openFileHandle(const Place& place, int access);

}  // namespace pinwell::files
