// The signer's message over a code directory, or over a package's table of contents, for deep
// verification: its signature must verify (codesign/cms_signature.h), and every part must be
// covered.
//
// | Part                          | Covered by                                                            |
// |-------------------------------|-----------------------------------------------------------------------|
// | content, signed attributes    | the signature                                                         |
// | versions, algorithms          | RFC 5652 and the signature, which allow only one value                |
// | the signer's certificate      | the signature of its issuer, if the message has that certificate      |
// | other certificates            | the same; each must have signed a covered one                         |
// | time-stamp token              | its own signature, and its imprint of the signature value             |
// | other unsigned attributes, revocation lists, certificates of other forms | nothing: they are refused  |
//
// No certificate is checked against an anchor. One gap remains: a certificate that is not self-signed and
// whose issuer's certificate is missing. Only its form, and its key if used, are checked.
#pragma once

#include <cstddef>

#include "base/bytes.h"

namespace pinwell::verify {

struct SignerMessage {
    bool hasTimestamp = false;

    /// Number of certificates, of the message and of its token, whose own signature cannot be verified.
    std::size_t certificatesWithoutIssuer = 0;
};

/// Throws codesign::CodeError unless `message` is a signer's message over `content` that passes all of the
/// above.
SignerMessage requireSignerMessage(base::ByteView message, base::ByteView content);

}  // namespace pinwell::verify
