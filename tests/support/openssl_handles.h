// Owning handles of OpenSSL objects, for the .cpp files that make or read certificates.
#pragma once

#include <openssl/asn1.h>
#include <openssl/bio.h>
#include <openssl/evp.h>
#include <openssl/x509.h>

#include "base/handle.h"

namespace pinwell::test {

using BioHandle = base::Handle<BIO, BIO_free_all>;
using CertificateHandle = base::Handle<X509, X509_free>;
using ExtensionHandle = base::Handle<X509_EXTENSION, X509_EXTENSION_free>;
using KeyHandle = base::Handle<EVP_PKEY, EVP_PKEY_free>;
using ObjectHandle = base::Handle<ASN1_OBJECT, ASN1_OBJECT_free>;

}  // namespace pinwell::test
