// The directory that describes the platform that a run trusts: its record service, its root certificates, the
// user's own trust settings, and the build variant.
#pragma once

#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/error.h"

namespace pinwell::config {

/// Longest platform.json that is read.
inline constexpr std::size_t kMaximumPlatformSettings = 1024 * 1024;

/// The paths below the platform directory. A directory or file that does not exist counts as an empty one.
/// Immutable; may be used from any thread. Files are read only on request.
class PlatformDirectory {
  public:
    explicit PlatformDirectory(std::string path) : path_(std::move(path)) {}

    /// $PINWELL_PLATFORM if it is set and not empty (and the process has no more rights than its caller),
    /// otherwise the installed system's directory.
    static PlatformDirectory current();

    const std::string& path() const noexcept { return path_; }

    /// The record service's API host, "HOST" or "HOST:PORT", from platform.json; the built-in default if the
    /// file or the entry is missing. The error names the file, and the position in it: a byte offset for a
    /// syntax error, the key for a wrong entry.
    base::Result<std::string> lumoraHost() const;

    /// All entries named *.pem in one of the certificate directories, in byte order. They include unreadable
    /// ones, so that errors can name these.
    std::vector<std::string> rootCertificateFiles() const { return pemFiles("roots"); }
    std::vector<std::string> compatibilityRootCertificateFiles() const { return pemFiles("compat-roots"); }
    std::vector<std::string> userAllowedCertificateFiles() const { return pemFiles("user-trust/allow"); }
    std::vector<std::string> userDeniedCertificateFiles() const { return pemFiles("user-trust/deny"); }

    /// Whether the build variant allows internal security policies.
    bool allowsInternalSecurityPolicies() const;

  private:
    std::vector<std::string> pemFiles(std::string_view directory) const;

    std::string path_;
};

}  // namespace pinwell::config
