// Files that pinwell-ticket makes.
#pragma once

#include <string>

#include "foundation/bytes.h"
#include "foundation/error.h"

namespace pinwell::ticket_files {

/// Makes a new file, and returns after it is on stable storage. An existing file stays unchanged (EEXIST).
/// After a failed write there is no file.
foundation::Result<void> writeNewFile(foundation::ByteView contents, const std::string& path);

/// The same, but replaces an existing file, completely or not at all.
foundation::Result<void> replaceFile(foundation::ByteView contents, const std::string& path);

}  // namespace pinwell::ticket_files
