// The certificates of the platform directory, and reading them from PEM.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "foundation/platform_directory.h"
#include "trust/deny_list.h"

namespace pinwell::trust {

/// Maximum size of a PEM file with trusted certificates; a larger file is ignored. A system's list of public
/// authorities has a quarter of a megabyte.
inline constexpr std::size_t kMaximumPemFileSize = 4ULL * 1024 * 1024;

/// Maximum size of a PEM file with distrusted certificates. Larger, because it is the user's own file, and an
/// ignored file would deny nothing.
inline constexpr std::size_t kMaximumDeniedFileSize = 256ULL * 1024 * 1024;

/// Maximum number of trusted certificates in a file; a file with more is ignored. Distrust has no such limit:
/// the size of the file bounds it.
inline constexpr std::size_t kMaximumCertificatesPerFile = 1024;

/// Whether one of the list is this certificate, byte for byte.
bool contains(const CertificateList& list, const X509Certificate& certificate);

struct Anchors {
    CertificateList roots;          // the platform's own roots
    CertificateList compatibility;  // further roots of the compatibility TLS policy
    CertificateList allowed;        // the user trusts these
    DenyList denied;                // the user distrusts these
};

/// The certificates of a PEM text; other blocks are skipped. `nullopt` if it has none, too many, or a damaged
/// block.
std::optional<CertificateList> readPem(ByteView text);

/// Adds the certificates of a PEM text to the distrusted ones. A damaged block does not affect the others:
/// `report` is called for it, with a reason such as "the block at line 7: it is not in base64". Also called
/// if there is no certificate at all.
void readDeniedPem(ByteView text, DenyList& into, const std::function<void(const std::string&)>& report);

/// The directory's current certificates. An unreadable entry named *.pem (a malformed file, a broken link or
/// a directory) is ignored and named in one line. Each damaged block of a file in user-trust/deny is named
/// too.
Anchors loadAnchors(const foundation::PlatformDirectory& directory,
                    const std::function<void(std::string_view)>& logError);

}  // namespace pinwell::trust
