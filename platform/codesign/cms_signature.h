// The signer's part of a signature: a CMS SignedData (RFC 5652), DER or BER, detached over a code directory,
// and the RFC 3161 time-stamp token that may stand among its signer's unsigned attributes (RFC 3161, appendix
// A).
//
// Nobody's certificate is held against an anchor here: who signed the code does not matter to this system,
// only that the signature is whole. Certificates must be inside the message; none is looked for elsewhere.
#pragma once

#include <optional>

#include "foundation/bytes.h"
#include "foundation/date.h"

namespace pinwell::codesign {

/// Longest message that is looked at; a signature with its certificates and time stamp takes some 10 KiB.
inline constexpr std::size_t kMaximumCmsLength = 4 * 1024 * 1024;

/// Whether `cms` is a SignedData, and nothing behind it, that is detached, has a signer, and whose every
/// signature over `content` verifies with the signer's certificate inside it.
bool verifyDetachedCms(foundation::ByteView cms, foundation::ByteView content);

/// The time in the first signer's time-stamp token, when the token's own signature verifies with a
/// certificate inside it and its imprint is that of the signer's signature value; nothing in every other
/// case.
std::optional<foundation::Date> secureTimestamp(foundation::ByteView cms);

}  // namespace pinwell::codesign
