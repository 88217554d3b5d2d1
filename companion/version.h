// The versions of the companions.
#pragma once

#include <string>
#include <string_view>

namespace pinwell::companion {

/// "PROGRAM 34.0 (commit 0123456789ab, OpenSSL 3.0.17, curl 7.88.1)": the libraries are the loaded ones.
/// Without a line end.
std::string versionText(std::string_view program);

/// "34.0"
std::string versionNumber();

}  // namespace pinwell::companion
