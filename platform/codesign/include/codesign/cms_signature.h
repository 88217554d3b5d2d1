// The signer's part of a signature: a CMS SignedData (cms_message.h), detached over a code directory, and the
// RFC 3161 time-stamp token that may be among its signer's unsigned attributes (RFC 3161, appendix A).
//
// No certificate is checked against an anchor here: this system needs only an intact signature, not the
// signer's identity. Certificates must be inside the message; none is searched elsewhere.
//
// Of the message, a library gets only the signer's public key, the signature value, and names of
// certificates, all of bounded size.
#pragma once

#include <optional>

#include "base/bytes.h"
#include "codesign/cms_message.h"
#include "values/date.h"

namespace pinwell::codesign {

/// Largest RSA key that is used.
inline constexpr std::size_t kMaximumRsaBits = 8192;

/// Longest public key that is read, with its algorithm: the largest RSA key, with an exponent as long as its
/// modulus, needs half of it.
inline constexpr std::size_t kMaximumPublicKeySize = 4096;

/// Throws CodeError (kInvalidSignature) unless `cms` is exactly one detached SignedData, whose only signature
/// over `content` verifies with the signer's certificate inside it.
///
/// If there are signed attributes, the signature covers them, in DER and in their order in the message. Their
/// content type must be the message's, and their message digest that of `content`. Otherwise `content` itself
/// is signed; only a message of plain data may have no attributes.
void requireDetachedCms(base::ByteView cms, base::ByteView content);

/// The time in the signer's time-stamp token, if the token's own signature verifies with a certificate inside
/// it and its imprint matches the signer's signature value; otherwise nullopt.
std::optional<values::Date> secureTimestamp(base::ByteView cms);

}  // namespace pinwell::codesign
