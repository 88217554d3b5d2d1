// Paths as URIs.
#pragma once

#include <string>

namespace pinwell::gate {

/// A path as a URI reference (RFC 3986): an absolute one as a file URL, a relative one as it is, with all
/// that needs it in percent encoding.
std::string uriOf(const std::string& path);

}  // namespace pinwell::gate
