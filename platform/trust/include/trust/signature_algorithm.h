// The signature algorithm of a certificate (RFC 5280, 4.1.1.2), read without a library.
//
//   AlgorithmIdentifier  SEQUENCE { OBJECT IDENTIFIER, parameters ANY OPTIONAL }
//
//   scheme          parameters        signature                             RFC
//   ECDSA           absent            SEQUENCE { INTEGER r, INTEGER s }     5758, 3.2
//   RSA, PKCS #1    NULL, or absent   as long as the modulus                4055, 5
//   RSASSA-PSS      the table below   as long as the modulus                4055, 3.1
//   Ed25519, Ed448  absent            64 bytes; 114 bytes                   8410, 3 and 6
//
//   RSASSA-PSS      SEQUENCE { [0] hash DEFAULT SHA-1, [1] MGF1 with hash DEFAULT SHA-1,
//                              [2] INTEGER salt length DEFAULT 20, [3] INTEGER trailer, 1 }
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "base/bytes.h"

namespace pinwell::trust {

inline constexpr std::string_view kPssOid = "1.2.840.113549.1.1.10";

/// A digest, by its name in OpenSSL.
struct Digest {
    std::string_view name;
    bool isSound = false;  // false for SHA-1 and MD5

    bool operator==(const Digest&) const = default;
};

/// No digest is longer than 64 bytes, and real salts are at most as long as their digest.
inline constexpr std::size_t kMaximumPssSalt = 512;

struct PssParameters {
    Digest digest;
    Digest maskDigest;
    std::size_t saltLength = 0;
};

struct SignatureAlgorithm {
    enum class Scheme { unknown, ecdsa, rsaPkcs1, rsaPss, ed25519, ed448 };

    std::string oid;  // dotted
    Scheme scheme = Scheme::unknown;
    Digest digest;                     // for ECDSA and RSA
    std::optional<PssParameters> pss;  // for RSASSA-PSS

    /// Whether the signature uses a digest that is not known to be sound.
    bool isWeak() const;
};

/// `contents` are the contents of the SEQUENCE. Parameters of another algorithm make it unknown. Throws
/// der::Malformed if it has no identifier or bytes are left over.
SignatureAlgorithm readSignatureAlgorithm(base::ByteView contents);

/// From the contents of the SEQUENCE of RSASSA-PSS's parameters. Throws der::Malformed.
PssParameters readPssParameters(base::ByteView contents);

}  // namespace pinwell::trust
