// Shared by the .cpp files that use OpenSSL. Do not include it in a header.
#pragma once

#include <openssl/asn1.h>
#include <openssl/bio.h>
#include <openssl/err.h>
#include <openssl/evp.h>
#include <openssl/x509.h>
#include <openssl/x509v3.h>

#include "base/bytes.h"
#include "base/handle.h"

namespace pinwell::crypto {

using base::Handle;

/// Restores this thread's OpenSSL error queue: a TLS session on the same thread reads that queue too, and
/// would mistake our refusals for its own.
class ErrorQueueGuard {
  public:
    ErrorQueueGuard() { ERR_set_mark(); }
    ~ErrorQueueGuard() { ERR_pop_to_mark(); }
    ErrorQueueGuard(const ErrorQueueGuard&) = delete;
    ErrorQueueGuard& operator=(const ErrorQueueGuard&) = delete;
};

inline const unsigned char* unsignedBytes(base::ByteView bytes) {
    return static_cast<const unsigned char*>(static_cast<const void*>(bytes.data()));
}

inline base::ByteView byteView(const unsigned char* bytes, int length) {
    if (bytes == nullptr || length <= 0) return {};
    return {static_cast<const std::byte*>(static_cast<const void*>(bytes)), static_cast<std::size_t>(length)};
}

inline base::ByteView byteView(const ASN1_STRING* string) {
    if (string == nullptr) return {};
    return byteView(ASN1_STRING_get0_data(string), ASN1_STRING_length(string));
}

}  // namespace pinwell::crypto
