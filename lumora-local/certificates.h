// Certificates (RFC 5280): reading them from PEM files, their names and dates, the conditions of ticket
// readers on a signer's chain, and making them. Includes OpenSSL's headers: for .cpp files of this folder.
//
// Each new certificate is of version 3 with a random serial number, a subject of organisation and common
// name, and key identifiers (4.2.1.1 and 4.2.1.2). It is signed with SHA-256.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "openssl.h"
#include "values/date.h"

namespace pinwell::lumora {

/// The first certificate of a file. Throws Failure: EX_NOINPUT if it cannot be read, EX_CONFIG if there is
/// none in it.
CertificateHandle readCertificateFile(const std::string& path);

/// All certificates of a file, at least one and at most `limit`. Throws Failure as above.
std::vector<CertificateHandle> readCertificateFiles(const std::string& path, std::size_t limit);

std::string encodeCertificate(X509* certificate);

/// Seconds since 1970. A certificate without a date that can be read has expired: 0.
std::int64_t expiryOf(X509* certificate);

/// The subject's common name, for messages; the whole subject if it has none.
std::string nameOf(X509* certificate);

/// The fault of the chain signer, intermediate, root; `nullopt` if clients that trust the root accept its
/// tickets. Dates do not count, as for tickets.
std::optional<std::string> faultOfSignerChain(const std::vector<CertificateHandle>& chain);

/// The fault of `certificate` as a certificate issued by `issuer`; `nullopt` if it has none.
std::optional<std::string> faultOfIssue(X509* certificate, X509* issuer);

bool carriesMarker(X509* certificate, std::string_view oid);

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
                             const IssuedCertificate& issuer, values::Date now);

/// A certification request (RFC 2986) in PEM for `profile`, signed by the key.
std::string requestCertificate(const CertificateProfile& profile, EVP_PKEY* key);

/// A certificate for a fresh key, signed by `issuer`, or self-signed without one. It is valid from a day
/// before `now` (clocks differ) for ten years, because nobody renews it at an isolated site. Throws Failure
/// if the cryptographic library fails.
IssuedCertificate issueCertificate(const CertificateProfile& profile, const IssuedCertificate* issuer,
                                   values::Date now);

}  // namespace pinwell::lumora
