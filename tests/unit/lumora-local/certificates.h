// Reads certificates and keys with only the cryptographic library.
#pragma once

#include <openssl/pem.h>
#include <openssl/x509_vfy.h>

#include <string>

#include "crypto/openssl.h"

namespace pinwell::lumora::test {

using crypto::BioHandle;
using crypto::CertificateHandle;
using crypto::KeyHandle;
using crypto::ObjectHandle;

inline CertificateHandle certificateFromPem(const std::string& pem) {
    const BioHandle bio(BIO_new_mem_buf(pem.data(), static_cast<int>(pem.size())));
    return CertificateHandle(PEM_read_bio_X509(bio.get(), nullptr, nullptr, nullptr));
}

inline KeyHandle keyFromPem(const std::string& pem) {
    const BioHandle bio(BIO_new_mem_buf(pem.data(), static_cast<int>(pem.size())));
    return KeyHandle(PEM_read_bio_PrivateKey(bio.get(), nullptr, nullptr, nullptr));
}

inline bool carries(X509* certificate, const std::string& oid) {
    const ObjectHandle object(OBJ_txt2obj(oid.c_str(), 1));
    return X509_get_ext_by_OBJ(certificate, object.get(), -1) >= 0;
}

}  // namespace pinwell::lumora::test
