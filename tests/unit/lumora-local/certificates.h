// Reads certificates and keys with only the cryptographic library.
#pragma once

#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/x509.h>
#include <openssl/x509_vfy.h>
#include <openssl/x509v3.h>

#include <string>

#include "base/bytes.h"
#include "support/openssl_handles.h"

namespace pinwell::lumora::test {

using pinwell::test::BioHandle;
using pinwell::test::CertificateHandle;
using pinwell::test::KeyHandle;
using pinwell::test::ObjectHandle;

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

inline const unsigned char* octets(base::ByteView bytes) {
    return reinterpret_cast<const unsigned char*>(bytes.data());
}

}  // namespace pinwell::lumora::test
