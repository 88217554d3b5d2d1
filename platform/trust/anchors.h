// The certificates of the platform directory, and reading them from PEM (RFC 7468).
#pragma once

#include <functional>
#include <vector>

#include "foundation/platform_directory.h"
#include "trust/certificate.h"

namespace pinwell::trust {

/// Of one PEM file; a larger one, or one that holds more, counts for nothing.
inline constexpr std::size_t kMaximumPemFileSize = 4ULL * 1024 * 1024;
inline constexpr std::size_t kMaximumCertificatesPerFile = 1024;

using CertificateList = std::vector<X509CertificateRef>;

/// Whether one of the list is this certificate, byte for byte.
bool contains(const CertificateList& list, const X509Certificate& certificate);

/// Whether distrust of those on the list reaches this certificate: it says the same as one of them, or has
/// the same subject and key. Not a comparison of bytes, since a signature can be written in more than one
/// way: from (r, s) of ECDSA anyone makes (r, n - s), which verifies as well. And what a person distrusts is
/// who holds the key, so a renewal, or a certificate that another authority gave for it, does not bring it
/// back.
bool isDistrusted(const X509Certificate& certificate, const CertificateList& denied);

struct Anchors {
    CertificateList roots;          // the platform maker's own
    CertificateList compatibility;  // further ones of the compatibility TLS policy
    CertificateList allowed;        // the user trusts these
    CertificateList denied;         // the user distrusts these
};

/// The certificates of a PEM text, other blocks passed over; nothing when it holds none, too many, or one
/// that cannot be read.
std::optional<CertificateList> readPem(ByteView text);

/// What stands in the directory now. What is named *.pem there and cannot be read, a link that
/// leads nowhere or a directory as well as a malformed file, counts for nothing and is named in one line.
Anchors loadAnchors(const foundation::PlatformDirectory& directory,
                    const std::function<void(std::string_view)>& logError);

}  // namespace pinwell::trust
