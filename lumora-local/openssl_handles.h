// Owning handles of OpenSSL objects, for the .cpp files that use them.
#pragma once

#include <openssl/bio.h>
#include <openssl/bn.h>
#include <openssl/err.h>
#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/x509.h>
#include <openssl/x509v3.h>

#include <array>
#include <string>

#include "base/bytes.h"
#include "base/handle.h"
#include "lumora-local/failure.h"
#include "values/format.h"

namespace pinwell::lumora {

using KeyHandle = base::Handle<EVP_PKEY, EVP_PKEY_free>;
using CertificateHandle = base::Handle<X509, X509_free>;
using ExtensionHandle = base::Handle<X509_EXTENSION, X509_EXTENSION_free>;
using BioHandle = base::Handle<BIO, BIO_free_all>;
using NumberHandle = base::Handle<BIGNUM, BN_free>;
using ObjectHandle = base::Handle<ASN1_OBJECT, ASN1_OBJECT_free>;
using DigestContextHandle = base::Handle<EVP_MD_CTX, EVP_MD_CTX_free>;

/// The library uses unsigned characters for bytes.
inline const unsigned char* octets(base::ByteView bytes) {
    return reinterpret_cast<const unsigned char*>(bytes.data());
}
inline unsigned char* octets(base::Data& data) {
    return reinterpret_cast<unsigned char*>(data.data());
}

/// The library's last error, as the failure of `action`; empties the library's queue.
inline Failure openSSLFailure(std::string_view action) {
    std::array<char, 256> text{};
    ERR_error_string_n(ERR_get_error(), text.data(), text.size());
    ERR_clear_error();
    return {EX_SOFTWARE, values::format("cannot %@: %@", action, std::string_view(text.data()))};
}

/// Throws unless a library call has returned its success value.
inline void require(bool succeeded, std::string_view action) {
    if (!succeeded) throw openSSLFailure(action);
}

/// DER by one of the library's encoders (i2d_X509 and its kind).
template <class Object>
base::Data encodeDer(int (*encoder)(Object*, unsigned char**), Object* object, std::string_view action) {
    const int length = encoder(object, nullptr);
    require(length > 0, action);
    base::Data der(static_cast<std::size_t>(length));
    unsigned char* end = octets(der);
    require(encoder(object, &end) == length, action);
    return der;
}

/// The text written into a BIO in memory.
inline std::string textOf(BIO* memory) {
    char* text = nullptr;
    const long length = BIO_get_mem_data(memory, &text);
    return {text, static_cast<std::size_t>(length)};
}

}  // namespace pinwell::lumora
