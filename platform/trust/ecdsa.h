// ECDSA signatures: their form, and signatures in a fixed-size field.
//
//   SEQUENCE { INTEGER r, INTEGER s }   X9.62 form, strict DER (RFC 3279, 2.2.3)
//   zero bytes                          up to the end of the field
//
// Refused, besides signatures that do not verify: integers that are negative, zero or not in their shortest
// form, anything after the second in the sequence, and a non-zero byte after the sequence.
#pragma once

#include "trust/public_key.h"

namespace pinwell::trust {

/// Whether it is exactly the sequence above.
bool isStrictEcdsaSignature(ByteView signature);

/// Over SHA-256 of the message. Returns false for a key that is not on an elliptic curve.
bool verifyEcdsa(const X509PublicKey& key, ByteView message, ByteView field);

}  // namespace pinwell::trust
