// The certificates that the user distrusts, and the effect of that.
#pragma once

#include <unordered_set>
#include <vector>

#include "trust/certificate.h"

namespace pinwell::trust {

using CertificateList = std::vector<X509CertificateRef>;

/// Distrust applies to a certificate's contents and to its key, not to its bytes. A signature has
/// several encodings: from (r, s) of ECDSA anyone can make (r, n - s), which verifies as well. A key
/// can be certified again: later, by another authority, with another name, algorithm or form of its
/// point.
class DenyList {
  public:
    DenyList() = default;
    DenyList(const CertificateList& certificates);  // NOLINT(google-explicit-constructor): the same thing

    void add(const X509CertificateRef& certificate);

    /// Adds a certificate that X509Certificate::parse refuses, because it may contain the key of an accepted
    /// one. Returns false, and adds nothing, if its signed part or its key cannot be found.
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

}  // namespace pinwell::trust
