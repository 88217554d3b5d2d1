// A subject's public key as its certificate writes it down (RFC 5280, 4.1.2.7), read without a library.
//
//   SubjectPublicKeyInfo  SEQUENCE { algorithm SEQUENCE { OBJECT IDENTIFIER, parameters ANY OPTIONAL },
//                                    key BIT STRING }
//
//   algorithm                    parameters            key                                       RFC
//   1.2.840.113549.1.1.1  RSA    NULL, or absent       SEQUENCE { INTEGER n, INTEGER e }         3279, 2.3.1
//   1.2.840.113549.1.1.10 PSS    absent, or PSS's      the same                                  4055, 3.1
//   1.2.840.10045.2.1     EC     a curve's identifier  04 x y, or 02 or 03 and x                 5480, 2
//   1.3.101.112, .113     EdDSA  absent                32 bytes; 57 bytes                        8410, 4
//
// Any other algorithm, curve or form is a key that cannot be used: DSA and Diffie-Hellman, curves described
// by their numbers (such a curve can be chosen to fit a private key of one's own), binary curves, and hybrid
// points (06, 07), which RFC 5480 forbids.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "foundation/bytes.h"
#include "trust/signature_algorithm.h"

namespace pinwell::trust {

/// The largest modulus, also of the signers of code. Verifying takes time with the cube of it, at most: 8192
/// bits take a third of a millisecond, 131072 bytes would take hours.
inline constexpr std::size_t kMaximumRsaBits = 8192;

/// The largest exponent. The usual one has 17 bits; verifying takes time in proportion to its bits.
inline constexpr std::size_t kMaximumRsaExponentBits = 64;

struct SubjectKey {
    enum class Kind { unusable, rsa, ellipticCurve, ed25519, ed448 };

    Kind kind = Kind::unusable;
    std::size_t bits = 0;    // of the modulus, or of the curve's field
    std::string algorithm;   // dotted
    std::string_view curve;  // OpenSSL's name; of an elliptic-curve key alone

    foundation::Data modulus;   // of an RSA key, big-endian, the first byte not zero
    foundation::Data exponent;  // the same
    foundation::Data point;     // of the other kinds, as written

    /// What every signature of this key must be; of a PSS key that has parameters alone.
    std::optional<PssParameters> pssOnly;
    bool isPss = false;

    /// Written by an algorithm that this reader does not know, or in a form that it does not take, a key has
    /// the same identity all the same: that of its modulus and exponent, or of its point (x, and whether y is
    /// odd), whatever algorithm, parameters and form of the point stand around them.
    foundation::Data identity;
};

/// `contents` are those of the outer SEQUENCE. Throws der::Malformed if they do not have the structure above;
/// a key that cannot be used is `unusable`.
SubjectKey readSubjectKey(foundation::ByteView contents);

/// The identity alone, from the contents of a SEQUENCE that need not be well-formed but for its two elements.
/// `nullopt` if they are not there.
std::optional<foundation::Data> readKeyIdentity(foundation::ByteView contents);

}  // namespace pinwell::trust
