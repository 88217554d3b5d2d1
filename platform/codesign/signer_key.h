// The key that a signature is verified with. Only here does a library see anything of a signer's message: a
// public key and a signature value, both of bounded size.
#pragma once

#include <optional>

#include "codesign/cms_message.h"
#include "foundation/bytes.h"

namespace pinwell::codesign {

/// Largest RSA key that is verified with.
inline constexpr std::size_t kMaximumRsaBits = 8192;

/// Longest public key that is looked at, its algorithm included: that RSA key, with an exponent as long as
/// its modulus, takes half of it.
inline constexpr std::size_t kMaximumPublicKeySize = 4096;

/// The digest of `bytes` by the algorithm's identifier: MD5, SHA-1, or one of the families SHA-2 and SHA-3;
/// nullopt for others.
std::optional<foundation::Data> messageDigest(const Algorithm& algorithm, foundation::ByteView bytes);

/// Verifies `signature` over `bytes` with a SubjectPublicKeyInfo. The digest is the signer's
/// `digestAlgorithm`, whatever the signature algorithm says, except that RSASSA-PSS must name the same.
/// Throws CodeError if the key is neither RSA (within kMaximumRsaBits) nor EC, if the signature algorithm is
/// not of the key's sort, or if the signature does not verify.
void requireSignature(foundation::ByteView publicKey, const Algorithm& digestAlgorithm,
                      const Algorithm& signatureAlgorithm, foundation::ByteView signature,
                      foundation::ByteView bytes);

}  // namespace pinwell::codesign
