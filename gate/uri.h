// Paths as URIs.
#pragma once

#include <string>

namespace pinwell::gate {

/// A path as a URI reference (RFC 3986): an absolute path as a file URL, a relative path unchanged, with
/// percent encoding where needed.
std::string uriOf(const std::string& path);

}  // namespace pinwell::gate
