// An X.509 certificate (RFC 5280, 4.1) with all fields that chains and checks need, read without a library.
//
//   Certificate     SEQUENCE { tbsCertificate, AlgorithmIdentifier, signature BIT STRING }
//   tbsCertificate  SEQUENCE {
//       [0] { version INTEGER }     absent for version 1; 1 and 2 mean versions 2 and 3
//       serial number INTEGER       any, in the fewest bytes
//       AlgorithmIdentifier         the same as outside (4.1.1.2)
//       issuer Name
//       SEQUENCE { notBefore, notAfter }   each UTCTime or GeneralizedTime
//       subject Name
//       SubjectPublicKeyInfo        subject_key.h
//       [1] issuer's and [2] subject's unique identifier BIT STRING   from version 2
//       [3] { Extensions } }        version 3 alone; extensions.h
//
// In DER: definite lengths in the shortest form, no bytes left over, nesting at most der::kMaximumNesting.
// Also refused: other versions, and fields that the stated version does not have.
#pragma once

#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "base/bytes.h"
#include "trust/der.h"
#include "trust/distinguished_name.h"
#include "trust/extensions.h"
#include "trust/public_key.h"
#include "trust/trust.h"
#include "values/date.h"

namespace pinwell::trust {

/// A longer certificate is refused. The same limit as that of a ticket's certificate element.
inline constexpr std::size_t kMaximumCertificateSize = 131072;

/// Views into the certificate's bytes, each of the contents of an element unless said otherwise.
struct CertificateParts {
    base::ByteView signedPart;  // the whole element
    base::ByteView serialNumber;
    base::ByteView innerAlgorithm;
    der::Element issuer;
    values::Date notBefore;
    values::Date notAfter;
    der::Element subject;
    base::ByteView subjectKey;
    std::optional<base::ByteView> extensions;
    base::ByteView outerAlgorithm;
    base::ByteView signature;  // without the count of unused bits, which is 0
};

/// Throws der::Malformed unless `certificate` is exactly one certificate.
CertificateParts readCertificateParts(base::ByteView certificate);

/// All fields except the verifying key are read by the constructor; afterwards any number of threads may use
/// it.
class X509Certificate final : public Certificate {
  public:
    /// Null unless `der` is exactly one well-formed certificate of at most kMaximumCertificateSize bytes.
    static std::shared_ptr<const X509Certificate> parse(ByteView der);

    const Data& der() const override { return der_; }
    std::string subjectSummary() const override { return summary_; }

    const CertificateExtensions& extensions() const noexcept { return extensions_; }
    Date notBefore() const noexcept { return parts_.notBefore; }
    Date notAfter() const noexcept { return parts_.notAfter; }
    bool hasEmptySubject() const noexcept { return subject_.isEmpty; }

    const DistinguishedName& subject() const noexcept { return subject_; }
    const DistinguishedName& issuer() const noexcept { return issuer_; }
    const SignatureAlgorithm& signatureAlgorithm() const noexcept { return algorithm_; }
    const SubjectKey& subjectKey() const noexcept { return subjectKey_; }

    /// Views into `der`.
    const CertificateParts& parts() const noexcept { return parts_; }

    /// Whether subject and issuer are the same name. Does not check the signature.
    bool isSelfIssued() const noexcept { return subject_.canonical == issuer_.canonical; }

    /// Null if it cannot be used: see `readSubjectKey`; or a point is not on its curve.
    const std::shared_ptr<const X509PublicKey>& publicKey() const;

    /// Whether the signature uses a digest that is not known to be sound.
    bool hasWeakSignatureDigest() const noexcept { return algorithm_.isWeak(); }

    bool isNamedAsIssuerOf(const X509Certificate& other) const;

    /// Whether this certificate's key verifies the other's signature. False if the other names two different
    /// algorithms, inside and outside.
    bool verifiesSignatureOf(const X509Certificate& other) const;

    /// Whether both have the same subject and the same key; other differences do not matter.
    bool hasSameSubjectAndKeyAs(const X509Certificate& other) const;

  private:
    explicit X509Certificate(Data der) : der_(std::move(der)) {}

    void read();

    Data der_;
    CertificateParts parts_;
    DistinguishedName subject_;
    DistinguishedName issuer_;
    SignatureAlgorithm algorithm_;
    SubjectKey subjectKey_;
    CertificateExtensions extensions_;
    std::string summary_;
    bool algorithmsAgree_ = false;

    // Made on first use: a chain needs only one of a thousand anchors.
    mutable std::once_flag keyMade_;
    mutable std::shared_ptr<const X509PublicKey> publicKey_;
};
using X509CertificateRef = std::shared_ptr<const X509Certificate>;

}  // namespace pinwell::trust
