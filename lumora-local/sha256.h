// The digests of this folder by their short names.
#pragma once

#include "crypto/crypto.h"

namespace pinwell::lumora {

/// 32 bytes. Throws std::bad_alloc if the cryptographic library fails.
inline base::Data sha256(base::ByteView bytes) {
    return crypto::digestOf(crypto::Digest::sha256, bytes);
}

/// 20 bytes. Throws as sha256().
inline base::Data sha1(base::ByteView bytes) {
    return crypto::digestOf(crypto::Digest::sha1, bytes);
}

}  // namespace pinwell::lumora
