// The certificates of the platform directory: trusted ones, distrusted ones, and reading them from PEM.
//
// A PEM text has blocks (RFC 7468, in its lax form):
//
//   -----BEGIN LABEL-----
//   base64, with white space anywhere
//   -----END LABEL-----
//
// Text outside blocks is skipped. A block extends to the next marker. If that is not its own end, the block
// is damaged; the next block is still read.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_set>
#include <vector>

#include "base/bytes.h"
#include "config/platform_directory.h"
#include "trust/certificate.h"

namespace pinwell::trust {

struct PemBlock {
    std::string_view label;          // a view into the text
    std::size_t line = 0;            // of its first marker, from 1
    std::optional<base::Data> data;  // `nullopt` if it is damaged
    std::string_view damage;         // why, for people; empty otherwise
};

/// In the order of the text. Time and memory are linear in its length.
std::vector<PemBlock> readPemBlocks(std::string_view text);

/// Whether the block's label is "CERTIFICATE" or one of its two older forms.
bool isCertificateBlock(const PemBlock& block);

using CertificateList = std::vector<X509CertificateRef>;

/// The certificates that the user distrusts. Distrust applies to a certificate's contents and to its key, not
/// to its bytes. A signature has several encodings: from (r, s) of ECDSA anyone can make (r, n - s), which
/// verifies as well. A key can be certified again: later, by another authority, with another name, algorithm
/// or form of its point.
class DenyList {
  public:
    DenyList() = default;
    DenyList(const CertificateList& certificates);  // NOLINT(google-explicit-constructor): the same thing

    void add(const X509CertificateRef& certificate);

    /// Adds a certificate although X509Certificate::parse refuses it: an accepted certificate may have the
    /// same key. Returns false, and adds nothing, if its signed part or its key cannot be found.
    bool addUnreadable(ByteView der);

    /// Whether the certificate has the same contents as one on the list (tbsCertificate, RFC 5280, 4.1.1.1),
    /// or the same key.
    bool reaches(const X509Certificate& certificate) const;

    /// The readable ones.
    const CertificateList& certificates() const noexcept { return certificates_; }

    /// The number of all, also of unreadable ones.
    std::size_t size() const noexcept { return size_; }

  private:
    CertificateList certificates_;
    std::unordered_set<std::string> signedParts_;
    std::unordered_set<std::string> keys_;
    std::size_t size_ = 0;
};

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
Anchors loadAnchors(const config::PlatformDirectory& directory,
                    const std::function<void(std::string_view)>& logError);

}  // namespace pinwell::trust
