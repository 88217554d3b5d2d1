// Certificates (RFC 5280) with fresh keys, for the service's authority and for the signer of the sample
// package.
//
// Each is of version 3 with a random serial number, a subject of organisation and common name, key
// identifiers (4.2.1.1 and 4.2.1.2), and is signed with SHA-256. Includes OpenSSL's headers: for .cpp files
// of this folder.
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

/// What one certificate says. Extension values are in the library's configuration syntax; an empty one leaves
/// the extension out.
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

/// A certificate for the key `subject`, of which the public half is enough, signed by `issuer`; as
/// issueCertificate otherwise.
CertificateHandle certifyKey(const CertificateProfile& profile, EVP_PKEY* subject,
                             const IssuedCertificate& issuer, foundation::Date now);

/// A certification request (RFC 2986) in PEM, which asks for `profile` and is signed by the key.
std::string requestCertificate(const CertificateProfile& profile, EVP_PKEY* key);

/// A certificate for a fresh key, signed by `issuer`, or by itself when there is none; valid from a day
/// before `now` (clocks differ) for ten years (an isolated site has nobody to renew it). Throws Failure when
/// the cryptographic library fails.
IssuedCertificate issueCertificate(const CertificateProfile& profile, const IssuedCertificate* issuer,
                                   foundation::Date now);

}  // namespace pinwell::lumora
