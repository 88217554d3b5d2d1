// The certificates of the platform directory, and reading them from PEM.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "foundation/platform_directory.h"
#include "trust/deny_list.h"

namespace pinwell::trust {

/// Of one PEM file whose certificates are trusted; a larger one counts for nothing. The list of public
/// authorities that systems carry has a quarter of a megabyte.
inline constexpr std::size_t kMaximumPemFileSize = 4ULL * 1024 * 1024;

/// Of a PEM file whose certificates are distrusted. It is the user's own, and one that is not read denies
/// nothing.
inline constexpr std::size_t kMaximumDeniedFileSize = 256ULL * 1024 * 1024;

/// Of a file whose certificates are trusted; one that holds more counts for nothing. Distrust has no such
/// limit: the size of the file bounds it.
inline constexpr std::size_t kMaximumCertificatesPerFile = 1024;

/// Whether one of the list is this certificate, byte for byte.
bool contains(const CertificateList& list, const X509Certificate& certificate);

struct Anchors {
    CertificateList roots;          // the platform maker's own
    CertificateList compatibility;  // further ones of the compatibility TLS policy
    CertificateList allowed;        // the user trusts these
    DenyList denied;                // the user distrusts these
};

/// The certificates of a PEM text, other blocks passed over; `nullopt` if it holds none, too many, or one
/// damaged block.
std::optional<CertificateList> readPem(ByteView text);

/// Adds the certificates of a PEM text to what is distrusted. A damaged block does not undo the others:
/// `report` is called for it, with a reason such as "the block at line 7: it is not in base64". Also called
/// if there is no certificate at all.
void readDeniedPem(ByteView text, DenyList& into, const std::function<void(const std::string&)>& report);

/// The directory's certificates as they are now. An entry named *.pem that cannot be read, a link that leads
/// nowhere or a directory as well as a malformed file, counts for nothing and is named in one line, and so is
/// each damaged block of a file in user-trust/deny.
Anchors loadAnchors(const foundation::PlatformDirectory& directory,
                    const std::function<void(std::string_view)>& logError);

}  // namespace pinwell::trust
