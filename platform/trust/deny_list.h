// What the user distrusts, and what that reaches.
#pragma once

#include <unordered_set>
#include <vector>

#include "trust/certificate.h"

namespace pinwell::trust {

using CertificateList = std::vector<X509CertificateRef>;

/// Distrust is of what a certificate says and of who holds its key, not of bytes. A signature can be written
/// in more than one way: from (r, s) of ECDSA anyone makes (r, n - s), which verifies as well. A key can be
/// certified again: later, by another authority, under another name or algorithm, in another form of its
/// point.
class DenyList {
  public:
    DenyList() = default;
    DenyList(const CertificateList& certificates);  // NOLINT(google-explicit-constructor): the same thing

    void add(const X509CertificateRef& certificate);

    /// A certificate that X509Certificate::parse refuses may hold the key of one that it takes. False if not
    /// even its signed part and its key can be found; nothing is added then.
    bool addUnreadable(ByteView der);

    /// Whether the certificate says the same as one on the list (tbsCertificate, RFC 5280, 4.1.1.1), or has
    /// the same key.
    bool reaches(const X509Certificate& certificate) const;

    /// Those that can be read.
    const CertificateList& certificates() const noexcept { return certificates_; }

    /// How many there are, also of those that cannot be read.
    std::size_t size() const noexcept { return size_; }

  private:
    CertificateList certificates_;
    std::unordered_set<std::string> signedParts_;
    std::unordered_set<std::string> keys_;
    std::size_t size_ = 0;
};

}  // namespace pinwell::trust
