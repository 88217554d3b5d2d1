// A subject's public key in its certificate (RFC 5280, 4.1.2.7), read without a library.
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
// Every other algorithm, curve or form is unusable: DSA and Diffie-Hellman, curves given by their numbers (an
// attacker can choose such a curve to fit a private key), binary curves, and hybrid points (06, 07), which
// RFC 5480 forbids.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/bytes.h"
#include "trust/signature_algorithm.h"

namespace pinwell::trust {

/// The largest modulus, also for signers of code. Verification time grows at most with its cube: 8192 bits
/// take a third of a millisecond, 131072 bytes would take hours.
inline constexpr std::size_t kMaximumRsaBits = 8192;

/// The largest exponent. The usual one has 17 bits; verification time is in proportion to its bits.
inline constexpr std::size_t kMaximumRsaExponentBits = 64;

struct SubjectKey {
    enum class Kind { unusable, rsa, ellipticCurve, ed25519, ed448 };

    Kind kind = Kind::unusable;
    std::size_t bits = 0;    // of the modulus, or of the curve's field
    std::string algorithm;   // dotted
    std::string_view curve;  // OpenSSL's name; of an elliptic-curve key alone

    base::Data modulus;   // for RSA, big-endian, the first byte not zero
    base::Data exponent;  // the same
    base::Data point;     // for other kinds, as written

    /// The required parameters of every signature; only for a PSS key with parameters.
    std::optional<PssParameters> pssOnly;
    bool isPss = false;

    /// The identity of the key: its modulus and exponent, or its point (x, and whether y is odd). It is the
    /// same for every algorithm, parameters and form of the point, even for ones that this reader does not
    /// accept.
    base::Data identity;
};

/// `contents` are the contents of the outer SEQUENCE. Throws der::Malformed if they do not have the structure
/// above; a key that cannot be used is `unusable`.
SubjectKey readSubjectKey(base::ByteView contents);

/// Only the identity, from the contents of a SEQUENCE of which only the two elements need to be well-formed.
/// `nullopt` if they are missing.
std::optional<base::Data> readKeyIdentity(base::ByteView contents);

}  // namespace pinwell::trust
