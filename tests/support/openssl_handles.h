// Owning handles of OpenSSL objects, for the .cpp files that make or read certificates.
#pragma once

#include <openssl/asn1.h>
#include <openssl/bio.h>
#include <openssl/evp.h>
#include <openssl/x509.h>

#include "foundation/handle.h"

namespace pinwell::test {

using BioHandle = foundation::Handle<BIO, BIO_free_all>;
using CertificateHandle = foundation::Handle<X509, X509_free>;
using ExtensionHandle = foundation::Handle<X509_EXTENSION, X509_EXTENSION_free>;
using KeyHandle = foundation::Handle<EVP_PKEY, EVP_PKEY_free>;
using ObjectHandle = foundation::Handle<ASN1_OBJECT, ASN1_OBJECT_free>;

}  // namespace pinwell::test
