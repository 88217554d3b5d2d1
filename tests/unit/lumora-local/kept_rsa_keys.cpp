#include "kept_rsa_keys.h"

#include <cstdarg>
#include <map>
#include <string_view>
#include <utility>

#include "crypto/openssl.h"

// NOLINTBEGIN(bugprone-reserved-identifier,readability-identifier-naming): the linker gives the names
extern "C" {
EVP_PKEY* __real_EVP_PKEY_Q_keygen(OSSL_LIB_CTX* context, const char* properties, const char* type, ...);
EVP_PKEY* __wrap_EVP_PKEY_Q_keygen(OSSL_LIB_CTX* context, const char* properties, const char* type, ...);
}

namespace pinwell::lumora {
namespace {

bool keysAreKept = false;
int nextKey = 0;

EVP_PKEY* keptKey(std::size_t bits) {
    static std::map<std::pair<std::size_t, int>, crypto::KeyHandle> keys;
    nextKey = 1 - nextKey;
    auto found = keys.find({bits, nextKey});
    if (found == keys.end()) {
        EVP_PKEY* const made = __real_EVP_PKEY_Q_keygen(nullptr, nullptr, "RSA", bits);
        if (made == nullptr) return nullptr;
        found = keys.emplace(std::pair(bits, nextKey), crypto::KeyHandle(made)).first;
    }
    EVP_PKEY_up_ref(found->second.get());
    return found->second.get();
}

}  // namespace

KeptRsaKeys::KeptRsaKeys() {
    keysAreKept = true;
}

KeptRsaKeys::~KeptRsaKeys() {
    keysAreKept = false;
}

}  // namespace pinwell::lumora

EVP_PKEY* __wrap_EVP_PKEY_Q_keygen(OSSL_LIB_CTX* context, const char* properties, const char* type, ...) {
    using namespace std::string_view_literals;
    std::va_list more;
    va_start(more, type);
    EVP_PKEY* key = nullptr;
    if (type == "RSA"sv) {
        const auto bits = va_arg(more, std::size_t);
        key = pinwell::lumora::keysAreKept ? pinwell::lumora::keptKey(bits)
                                      : __real_EVP_PKEY_Q_keygen(context, properties, type, bits);
    } else if (type == "EC"sv) {
        key = __real_EVP_PKEY_Q_keygen(context, properties, type, va_arg(more, const char*));
    } else {
        key = __real_EVP_PKEY_Q_keygen(context, properties, type);
    }
    va_end(more);
    return key;
}
// NOLINTEND(bugprone-reserved-identifier,readability-identifier-naming)
