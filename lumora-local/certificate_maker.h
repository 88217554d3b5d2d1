// Certificates (RFC 5280) with fresh keys, for the service's authority and for the signer of the sample
// package.
//
// Each is of version 3 with a random serial number, a subject of organisation and common name, and key
// identifiers (4.2.1.1 and 4.2.1.2). It is signed with SHA-256. Includes OpenSSL's headers: for .cpp files of
// this folder.
#pragma once

#include <string>
#include <string_view>

#include "foundation/date.h"
#include "lumora-local/openssl_handles.h"

namespace pinwell::lumora {

struct IssuedCertificate {
    CertificateHandle certificate;
    KeyHandle key;
};

enum class KeyKind { ellipticCurveP256, rsa2048 };

/// The contents of one certificate. Extension values are in the library's configuration syntax; an empty
/// value omits the extension.
struct CertificateProfile {
    std::string commonName;
    std::string basicConstraints;
    std::string keyUsage;
    std::string extendedKeyUsage{};
    std::string subjectAlternativeName{};
    std::string_view markerOid{};
    KeyKind keyKind = KeyKind::ellipticCurveP256;
};

KeyHandle makeKey(KeyKind kind);

/// A certificate for the key `subject`, signed by `issuer`. The public half of the key is enough. Otherwise
/// like issueCertificate.
CertificateHandle certifyKey(const CertificateProfile& profile, EVP_PKEY* subject,
                             const IssuedCertificate& issuer, foundation::Date now);

/// A certification request (RFC 2986) in PEM for `profile`, signed by the key.
std::string requestCertificate(const CertificateProfile& profile, EVP_PKEY* key);

/// A certificate for a fresh key, signed by `issuer`, or self-signed without one. It is valid from a day
/// before `now` (clocks differ) for ten years, because nobody renews it at an isolated site. Throws Failure
/// if the cryptographic library fails.
IssuedCertificate issueCertificate(const CertificateProfile& profile, const IssuedCertificate* issuer,
                                   foundation::Date now);

}  // namespace pinwell::lumora
