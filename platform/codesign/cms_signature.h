// The signer's part of a signature: a CMS SignedData (cms_message.h), detached over a code directory, and the
// RFC 3161 time-stamp token that may stand among its signer's unsigned attributes (RFC 3161, appendix A).
//
// Nobody's certificate is held against an anchor here: who signed the code does not matter to this system,
// only that the signature is whole. Certificates must be inside the message; none is looked for elsewhere.
#pragma once

#include <optional>

#include "foundation/bytes.h"
#include "foundation/date.h"

namespace pinwell::codesign {

/// Throws CodeError (kInvalidSignature) unless `cms` is a SignedData, and nothing after it, that is detached
/// and whose one signature over `content` verifies with the signer's certificate inside it.
///
/// With signed attributes, these are what is signed, in DER and in their order in the message; the content
/// type among them must be the message's, and the message digest that of `content`. Without, which only a
/// message of plain data may do, `content` itself is signed.
void requireDetachedCms(foundation::ByteView cms, foundation::ByteView content);

/// The time in the signer's time-stamp token, if the token's own signature verifies with a certificate inside
/// it and its imprint is that of the signer's signature value; nullopt in every other case.
std::optional<foundation::Date> secureTimestamp(foundation::ByteView cms);

}  // namespace pinwell::codesign
