// The key that verifies a signature. Only here a library gets parts of a signer's message: a public key and a
// signature value, both of bounded size.
#pragma once

#include <optional>

#include "codesign/cms_message.h"
#include "foundation/bytes.h"

namespace pinwell::codesign {

/// Largest RSA key that is used.
inline constexpr std::size_t kMaximumRsaBits = 8192;

/// Longest public key that is read, with its algorithm: the largest RSA key, with an exponent as long as its
/// modulus, needs half of it.
inline constexpr std::size_t kMaximumPublicKeySize = 4096;

/// The digest of `bytes` by the algorithm's identifier: MD5, SHA-1, or one of the families SHA-2 and SHA-3;
/// nullopt for others.
std::optional<foundation::Data> messageDigest(const Algorithm& algorithm, foundation::ByteView bytes);

/// Verifies `signature` over `bytes` with a SubjectPublicKeyInfo. The digest is the signer's
/// `digestAlgorithm`; the signature algorithm's digest is ignored, except that RSASSA-PSS must name the same.
/// Throws CodeError if the key is neither RSA (within kMaximumRsaBits) nor EC, if the signature algorithm
/// does not fit the key, or if the signature does not verify.
void requireSignature(foundation::ByteView publicKey, const Algorithm& digestAlgorithm,
                      const Algorithm& signatureAlgorithm, foundation::ByteView signature,
                      foundation::ByteView bytes);

}  // namespace pinwell::codesign
