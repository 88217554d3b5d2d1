// Files that pinwell-ticket makes.
#pragma once

#include <string>

#include "foundation/bytes.h"
#include "foundation/error.h"

namespace pinwell::ticket_files {

/// A new file, on stable storage when this returns. What is there already stays as it is (EEXIST). A failed
/// write leaves nothing there.
foundation::Result<void> writeNewFile(foundation::ByteView contents, const std::string& path);

/// The same, in the place of what is there, as a whole or not at all.
foundation::Result<void> replaceFile(foundation::ByteView contents, const std::string& path);

}  // namespace pinwell::ticket_files
