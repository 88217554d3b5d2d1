// A public key that can verify, and the signatures of certificates that it verifies. OpenSSL computes with
// numbers, points and names that `readSubjectKey` has read; it never parses an encoding.
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "trust/signature_algorithm.h"
#include "trust/subject_key.h"
#include "trust/trust.h"

struct evp_pkey_st;  // OpenSSL's EVP_PKEY

namespace pinwell::trust {

/// Immutable; any thread may use it.
class X509PublicKey final : public PublicKey {
  public:
    /// Null if the key is `unusable`, or its point is not on its curve.
    static std::shared_ptr<const X509PublicKey> make(const SubjectKey& key);

    /// The same from a whole SubjectPublicKeyInfo in DER.
    static std::shared_ptr<const X509PublicKey> fromSubjectPublicKeyInfo(ByteView der);

    evp_pkey_st* native() const noexcept { return key_.get(); }

    /// kKeyTypeRSA, kKeyTypeEllipticCurve, or empty for any other kind.
    std::string_view type() const noexcept;
    std::size_t bits() const noexcept { return description_.bits; }

    /// OpenSSL's name; of an elliptic-curve key alone.
    std::string_view curve() const noexcept { return description_.curve; }

    /// Whether the key verifies a certificate's signature. False for an algorithm that is unknown or does not
    /// fit the key, for ECDSA signatures that are not in strict DER, and for signatures of the wrong length.
    bool verifies(const SignatureAlgorithm& algorithm, ByteView message, ByteView signature) const;

  private:
    X509PublicKey(SubjectKey description, std::shared_ptr<evp_pkey_st> key)
        : description_(std::move(description)), key_(std::move(key)) {}

    bool isFor(const SignatureAlgorithm& algorithm) const;
    bool hasProperLength(const SignatureAlgorithm& algorithm, ByteView signature) const;

    SubjectKey description_;
    std::shared_ptr<evp_pkey_st> key_;
};

// ECDSA signatures: their form, and signatures in a fixed-size field.
//
//   SEQUENCE { INTEGER r, INTEGER s }   X9.62 form, strict DER (RFC 3279, 2.2.3)
//   zero bytes                          up to the end of the field
//
// Refused, besides signatures that do not verify: integers that are negative, zero or not in their shortest
// form, anything after the second in the sequence, and a non-zero byte after the sequence.

/// Whether it is exactly the sequence above.
bool isStrictEcdsaSignature(ByteView signature);

/// Over SHA-256 of the message. Returns false for a key that is not on an elliptic curve.
bool verifyEcdsa(const X509PublicKey& key, ByteView message, ByteView field);

}  // namespace pinwell::trust
