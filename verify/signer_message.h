// The signer's message over a code directory, or over a package's table of contents, as deep verification
// judges it: that its signature verifies (codesign/cms_signature.h), and that nothing in it is left
// uncovered.
//
// | Part                          | Covered by                                                            |
// |-------------------------------|-----------------------------------------------------------------------|
// | content, signed attributes    | the signature                                                         |
// | versions, algorithms          | what RFC 5652 and the signature leave as the one possible value       |
// | the signer's certificate      | the signature of its issuer, if the message has that certificate      |
// | other certificates            | the same; each must have signed one that counts                       |
// | time-stamp token              | its own signature, and its imprint of the signature value             |
// | other unsigned attributes, revocation lists, certificates of other forms | nothing: they are refused  |
//
// Nobody's certificate is held against an anchor. Not covered: in a certificate that is not self-signed and
// whose issuer's is not in the message, what neither its form nor its use as a key shows.
#pragma once

#include <cstddef>

#include "foundation/bytes.h"

namespace pinwell::verify {

struct SignerMessage {
    bool hasTimestamp = false;

    /// Certificates, of the message and of its token, whose own signature nothing in it verifies.
    std::size_t certificatesWithoutIssuer = 0;
};

/// Throws codesign::CodeError unless `message` is a signer's message over `content` with all of the above.
SignerMessage requireSignerMessage(foundation::ByteView message, foundation::ByteView content);

}  // namespace pinwell::verify
