// Where a symbolic link inside a bundle leads.
#pragma once

#include <string_view>

#include "verify/directory.h"

namespace pinwell::verify {

/// Whether the link at `path` below `root` leads to something at or below `root`, by way of other links too.
/// A target that does not exist is inside if its path never leaves the root. Throws codesign::CodeError if
/// something on the way cannot be read.
bool leadsInside(const DirectoryRef& root, std::string_view path);

}  // namespace pinwell::verify
