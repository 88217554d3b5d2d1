#include "lumora-local/sha256.h"

#include "crypto/crypto.h"

namespace pinwell::lumora {

foundation::Data sha256(foundation::ByteView bytes) {
    return crypto::digestOf(crypto::Digest::sha256, bytes);
}

foundation::Data sha1(foundation::ByteView bytes) {
    return crypto::digestOf(crypto::Digest::sha1, bytes);
}

}  // namespace pinwell::lumora
