// The one directory that describes the platform a run trusts: its record service, its root certificates, the
// user's own trust settings, and the build variant.
#pragma once

#include <string>
#include <vector>

#include "foundation/error.h"

namespace pinwell::foundation {

/// Longest platform.json that is read.
inline constexpr std::size_t kMaximumPlatformSettings = 1024 * 1024;

/// Where things are below the platform directory. A directory or file that does not exist is the same as an
/// empty one. Immutable; may be used from any thread. Nothing is read until it is asked for.
class PlatformDirectory {
  public:
    explicit PlatformDirectory(std::string path) : path_(std::move(path)) {}

    /// $PINWELL_PLATFORM when it is set and not empty (and the process runs with no more rights than its
    /// caller), else the installed system's own.
    static PlatformDirectory current();

    const std::string& path() const noexcept { return path_; }

    /// The record service's API host, "HOST" or "HOST:PORT", from platform.json; the built-in default when
    /// the file or the entry is absent. The error names the file, and the position in it: a byte offset for a
    /// syntax error, the key for an entry that is not what it should be.
    Result<std::string> lumoraHost() const;

    /// All that is named *.pem in one of the certificate directories, in byte order: files, and also what
    /// cannot be read as one, so that it can be named.
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

}  // namespace pinwell::foundation
