// ECDSA signatures: their form, and those in a fixed-size field.
//
//   SEQUENCE { INTEGER r, INTEGER s }   X9.62 form, strict DER (RFC 3279, 2.2.3)
//   zero bytes                          up to the end of the field
//
// Refused besides what does not verify: integers that are negative, zero or not in their shortest form,
// anything in the sequence behind the second, and a non-zero byte behind the sequence.
#pragma once

#include "trust/public_key.h"

namespace pinwell::trust {

/// Whether it is the sequence above, with nothing behind it.
bool isStrictEcdsaSignature(ByteView signature);

/// Over SHA-256 of the message. A key that is not on an elliptic curve verifies nothing.
bool verifyEcdsa(const X509PublicKey& key, ByteView message, ByteView field);

}  // namespace pinwell::trust
