// A parsed certificate with all that chains and checks ask of it. OpenSSL reads it; nothing of OpenSSL is
// seen here.
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "trust/extensions.h"
#include "trust/trust.h"

struct evp_pkey_st;  // OpenSSL's EVP_PKEY

namespace pinwell::trust {

/// A longer certificate is refused. The same limit as that of a ticket's certificate element.
inline constexpr std::size_t kMaximumCertificateSize = 131072;

/// A key of a kind that OpenSSL knows, on a named curve when it is an elliptic-curve one.
class X509PublicKey final : public PublicKey {
  public:
    explicit X509PublicKey(std::shared_ptr<evp_pkey_st> key) : key_(std::move(key)) {}

    evp_pkey_st* native() const noexcept { return key_.get(); }

    /// kKeyTypeRSA, kKeyTypeEllipticCurve, or empty for any other kind.
    std::string_view type() const;
    int bits() const;

  private:
    std::shared_ptr<evp_pkey_st> key_;
};

/// Everything is read when it is made, so that any number of threads may ask afterwards.
class X509Certificate final : public Certificate {
  public:
    /// Null unless `der` is exactly one well-formed certificate of at most kMaximumCertificateSize bytes.
    static std::shared_ptr<const X509Certificate> parse(ByteView der);

    const Data& der() const override { return der_; }
    std::string subjectSummary() const override { return summary_; }

    const CertificateExtensions& extensions() const noexcept { return extensions_; }
    Date notBefore() const noexcept { return notBefore_; }
    Date notAfter() const noexcept { return notAfter_; }
    bool hasEmptySubject() const noexcept { return emptySubject_; }

    /// Whether subject and issuer are the same name. Says nothing about the signature.
    bool isSelfIssued() const noexcept { return selfIssued_; }

    /// Null when OpenSSL cannot read it, or it brings its own curve instead of naming one.
    const std::shared_ptr<const X509PublicKey>& publicKey() const noexcept { return publicKey_; }

    /// Whether the signature rests on a digest that is not known to be sound.
    bool hasWeakSignatureDigest() const noexcept { return weakDigest_; }

    bool isNamedAsIssuerOf(const X509Certificate& other) const;

    /// Whether this certificate's key verifies the other's signature.
    bool verifiesSignatureOf(const X509Certificate& other) const;

    /// Whether both say the same, byte for byte (tbsCertificate, RFC 5280, 4.1.1.1), whatever their
    /// signatures are.
    bool saysTheSameAs(const X509Certificate& other) const;

    /// Whether both are about the same subject and the same key, however they differ otherwise.
    bool hasSameSubjectAndKeyAs(const X509Certificate& other) const;

  private:
    explicit X509Certificate(std::shared_ptr<x509_st> certificate, Data der)
        : certificate_(std::move(certificate)), der_(std::move(der)) {}

    std::shared_ptr<x509_st> certificate_;
    Data der_;
    std::string summary_;
    CertificateExtensions extensions_;
    Date notBefore_;
    Date notAfter_;
    bool emptySubject_ = false;
    bool selfIssued_ = false;
    bool weakDigest_ = true;
    std::shared_ptr<const X509PublicKey> publicKey_;
};
using X509CertificateRef = std::shared_ptr<const X509Certificate>;

}  // namespace pinwell::trust
