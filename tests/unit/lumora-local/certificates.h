// Reads certificates and keys with only the cryptographic library.
#pragma once

#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/x509.h>
#include <openssl/x509_vfy.h>
#include <openssl/x509v3.h>

#include <string>

#include "foundation/bytes.h"
#include "foundation/handle.h"

namespace pinwell::lumora::test {

using Bio = foundation::Handle<BIO, BIO_free_all>;
using Certificate = foundation::Handle<X509, X509_free>;
using Key = foundation::Handle<EVP_PKEY, EVP_PKEY_free>;
using Object = foundation::Handle<ASN1_OBJECT, ASN1_OBJECT_free>;

inline Certificate certificateFromPem(const std::string& pem) {
    const Bio bio(BIO_new_mem_buf(pem.data(), static_cast<int>(pem.size())));
    return Certificate(PEM_read_bio_X509(bio.get(), nullptr, nullptr, nullptr));
}

inline Key keyFromPem(const std::string& pem) {
    const Bio bio(BIO_new_mem_buf(pem.data(), static_cast<int>(pem.size())));
    return Key(PEM_read_bio_PrivateKey(bio.get(), nullptr, nullptr, nullptr));
}

inline bool carries(X509* certificate, const std::string& oid) {
    const Object object(OBJ_txt2obj(oid.c_str(), 1));
    return X509_get_ext_by_OBJ(certificate, object.get(), -1) >= 0;
}

inline const unsigned char* octets(foundation::ByteView bytes) {
    return reinterpret_cast<const unsigned char*>(bytes.data());
}

}  // namespace pinwell::lumora::test
