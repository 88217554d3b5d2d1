// The contents of a certificate, for people. Does not judge it.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "base/bytes.h"
#include "values/date.h"

namespace pinwell::trust {

/// Names are in the string form of RFC 4514 (last attribute first), control characters escaped, in UTF-8.
struct CertificateDescription {
    struct Extension {
        std::string oid;  // dotted
        bool critical = false;
        bool malformed = false;  // unreadable, or occurs more than once
    };

    std::string subject;
    std::string issuer;
    std::string summary;       // as Certificate::subjectSummary
    std::string serialNumber;  // hexadecimal, lower case, with a minus sign if negative
    values::Date notBefore;
    values::Date notAfter;

    std::string keyType;  // "EC", "RSA", OpenSSL's name for any other; empty if the key is unreadable
    int keyBits = 0;
    std::string curve;               // OpenSSL's name; of an elliptic-curve key alone
    std::string signatureAlgorithm;  // OpenSSL's long name, or a dotted OID

    bool isSelfIssued = false;
    bool isCertificateAuthority = false;
    std::vector<Extension> extensions;  // in the certificate's order

    base::Data sha1Fingerprint;
    base::Data sha256Fingerprint;
    std::optional<base::Data> subjectKeyIdentifier;
    std::optional<base::Data> authorityKeyIdentifier;
};

/// `nullopt` unless `der` is exactly one certificate that TrustService::parseCertificate would accept.
std::optional<CertificateDescription> describeCertificate(base::ByteView der);

}  // namespace pinwell::trust
