// Making signed tickets.
//
// Container (all integers little-endian; the signature covers everything before it):
//
//   offset  size  field
//   0       4     magic "s8ch"
//   4       2     version 1
//   6       2     reserved, 0
//   8       4     A, length of the certificate block
//   12      4     B, length of the payload
//   16      A     DER SEQUENCE of the signer's certificate, its issuer's and the root's
//   16+A    B     payload
//   16+A+B  72    ECDSA signature over SHA-256, DER (X9.62), left-aligned, followed by zero bytes
//
// Payload:
//
//   0       4     magic "m8tk"
//   4       2     version: 2; 1 for a ticket over a hash of unknown digest type
//   6       2     hash length: 48 when a listed hash has 48 bytes, else 20
//   8       4     number of entries
//   12      4     flags: bit 0 revoked
//   16      8     signature time, seconds since 1970-01-01 UTC
//   24      ...   entries: (version 2: one byte digest type,) the hash, zero bytes up to the hash length
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "base/bytes.h"
#include "record_name.h"
#include "signing_key.h"
#include "values/date.h"

namespace pinwell::lumora {

/// The maximum that readers of tickets accept.
inline constexpr std::size_t kMaximumPayloadSize = 16 * 1024 * 1024;
inline constexpr std::size_t kSignatureFieldSize = 72;

struct TicketContents {
    std::vector<CodeHash> hashes;  // the artefact's own first
    bool revoked = false;
    values::Date signedAt;
};

/// Only the payload. Throws Failure (EX_DATAERR) for a hash whose length does not fit its digest type, for a
/// digest type that no ticket can contain, and for more hashes than the maximum allows.
base::Data encodeTicketPayload(const TicketContents& contents);

/// Signs with one key. Immutable after construction; for any thread.
class TicketSigner {
  public:
    /// `chainPaths` are PEM files, the signer's own certificate first. Throws Failure (EX_CONFIG) if the key
    /// is not the first certificate's.
    TicketSigner(std::shared_ptr<const SigningKey> key, const std::vector<std::string>& chainPaths);

    /// With the key in a PEM file. Throws Failure when one cannot be used.
    TicketSigner(const std::string& keyPath, const std::vector<std::string>& chainPaths);

    /// A complete container. Throws Failure as encodeTicketPayload does.
    base::Data makeTicket(const TicketContents& contents) const;

  private:
    std::shared_ptr<const SigningKey> key_;
    base::Data certificateBlock_;
};

}  // namespace pinwell::lumora
