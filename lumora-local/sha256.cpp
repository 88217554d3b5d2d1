#include "lumora-local/sha256.h"

#include "lumora-local/openssl_handles.h"

namespace pinwell::lumora {

foundation::Data sha256(foundation::ByteView bytes) {
    foundation::Data digest(32);
    require(EVP_Digest(bytes.data(), bytes.size(), octets(digest), nullptr, EVP_sha256(), nullptr) == 1,
            "compute a digest");
    return digest;
}

}  // namespace pinwell::lumora
