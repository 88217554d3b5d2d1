// Shared by the .cpp files that use OpenSSL: owners of its objects, and its types of bytes. Outside of
// lumora-local, do not include it in a header.
#pragma once

#include <openssl/asn1.h>
#include <openssl/bio.h>
#include <openssl/bn.h>
#include <openssl/cms.h>
#include <openssl/ec.h>
#include <openssl/err.h>
#include <openssl/evp.h>
#include <openssl/param_build.h>
#include <openssl/x509.h>
#include <openssl/x509v3.h>

#include <string>

#include "base/bytes.h"
#include "base/handle.h"

namespace pinwell::crypto {

using base::Handle;

using AlgorithmHandle = Handle<X509_ALGOR, X509_ALGOR_free>;
using BioHandle = Handle<BIO, BIO_free_all>;
using CertificateHandle = Handle<X509, X509_free>;
using DigestContextHandle = Handle<EVP_MD_CTX, EVP_MD_CTX_free>;
using EcdsaSignatureHandle = Handle<ECDSA_SIG, ECDSA_SIG_free>;
using ExtensionHandle = Handle<X509_EXTENSION, X509_EXTENSION_free>;
using KeyContextHandle = Handle<EVP_PKEY_CTX, EVP_PKEY_CTX_free>;
using KeyHandle = Handle<EVP_PKEY, EVP_PKEY_free>;
using MessageHandle = Handle<CMS_ContentInfo, CMS_ContentInfo_free>;
using NameHandle = Handle<X509_NAME, X509_NAME_free>;
using NumberHandle = Handle<BIGNUM, BN_free>;
using ObjectHandle = Handle<ASN1_OBJECT, ASN1_OBJECT_free>;
using OctetStringHandle = Handle<ASN1_OCTET_STRING, ASN1_OCTET_STRING_free>;
using ParameterBuilderHandle = Handle<OSSL_PARAM_BLD, OSSL_PARAM_BLD_free>;
using ParametersHandle = Handle<OSSL_PARAM, OSSL_PARAM_free>;

/// Frees a list of certificates and the certificates in it.
struct CertificateListDeleter {
    void operator()(STACK_OF(X509) * list) const noexcept { sk_X509_pop_free(list, X509_free); }
};
using CertificateListHandle = std::unique_ptr<STACK_OF(X509), CertificateListDeleter>;

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

inline unsigned char* unsignedBytes(base::Data& data) {
    return static_cast<unsigned char*>(static_cast<void*>(data.data()));
}

inline base::ByteView byteView(const unsigned char* bytes, int length) {
    if (bytes == nullptr || length <= 0) return {};
    return {static_cast<const std::byte*>(static_cast<const void*>(bytes)), static_cast<std::size_t>(length)};
}

inline base::ByteView byteView(const ASN1_STRING* string) {
    if (string == nullptr) return {};
    return byteView(ASN1_STRING_get0_data(string), ASN1_STRING_length(string));
}

/// DER by one of OpenSSL's encoders (i2d_X509 and its kind); empty if it fails.
template <class Object>
base::Data encodedBy(int (*encoder)(const Object*, unsigned char**), const Object* object) {
    const int length = encoder(object, nullptr);
    if (length <= 0) return {};
    base::Data der(static_cast<std::size_t>(length));
    unsigned char* end = unsignedBytes(der);
    return encoder(object, &end) == length ? der : base::Data();
}

/// The text that was written to a BIO in memory.
inline std::string textOf(BIO* memory) {
    char* text = nullptr;
    const long length = BIO_get_mem_data(memory, &text);
    return length > 0 ? std::string(text, static_cast<std::size_t>(length)) : std::string();
}

}  // namespace pinwell::crypto
