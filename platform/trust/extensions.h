// The extensions of a certificate that the checks ask about, read once (RFC 5280, 4.2).
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/bytes.h"

struct x509_st;  // OpenSSL's X509

namespace pinwell::trust {

struct BasicConstraints {
    bool isCertificateAuthority = false;
    std::optional<std::uint64_t> pathLength;
};

/// Bits of the key usage extension, as it numbers them.
inline constexpr std::uint32_t kKeyUsageCertificateSigning = 1U << 5U;

inline constexpr std::string_view kServerAuthenticationPurpose = "1.3.6.1.5.5.7.3.1";

struct AlternativeNames {
    std::vector<std::string> dnsNames;
    std::vector<foundation::Data> addresses;  // 4 or 16 bytes, network order
};

/// An extension that is absent, and one that cannot be read, is no value here; the latter is also listed as
/// malformed.
struct CertificateExtensions {
    struct Entry {
        std::string oid;  // dotted
        bool critical = false;
    };

    std::vector<Entry> entries;
    std::vector<std::string> malformed;  // OIDs of those that cannot be read, or occur more than once

    std::optional<BasicConstraints> basicConstraints;
    std::optional<std::uint32_t> keyUsage;  // a malformed one permits nothing
    std::optional<std::vector<std::string>> purposes;
    std::optional<AlternativeNames> alternativeNames;
    std::optional<foundation::Data> subjectKeyIdentifier;
    std::optional<foundation::Data> authorityKeyIdentifier;

    bool carries(std::string_view oid) const;
};

/// Whether the checks know what an extension of this OID says, so that it may be critical.
bool isUnderstoodExtension(std::string_view oid);

CertificateExtensions readExtensions(const x509_st* certificate);

}  // namespace pinwell::trust
