#include "lumora-local/sha256.h"

#include "lumora-local/openssl_handles.h"

namespace pinwell::lumora {

namespace {

foundation::Data digestOf(foundation::ByteView bytes, const EVP_MD* algorithm, std::size_t length) {
    foundation::Data digest(length);
    require(EVP_Digest(bytes.data(), bytes.size(), octets(digest), nullptr, algorithm, nullptr) == 1,
            "compute a digest");
    return digest;
}

}  // namespace

foundation::Data sha256(foundation::ByteView bytes) {
    return digestOf(bytes, EVP_sha256(), 32);
}

foundation::Data sha1(foundation::ByteView bytes) {
    return digestOf(bytes, EVP_sha1(), 20);
}

}  // namespace pinwell::lumora
