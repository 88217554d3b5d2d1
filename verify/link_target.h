// The target of a symbolic link inside a bundle.
#pragma once

#include <string_view>

#include "verify/directory.h"

namespace pinwell::verify {

/// Whether the link at `path` below `root` leads to `root` or below it, also through other links. A target
/// that does not exist is inside if its path never leaves the root. Throws codesign::CodeError if a step
/// cannot be read.
bool leadsInside(const DirectoryRef& root, std::string_view path);

}  // namespace pinwell::verify
