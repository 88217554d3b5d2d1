// The extensions of a certificate that the checks need, read once (RFC 5280, 4.2), without a library.
//
//   Extensions  SEQUENCE OF SEQUENCE { OBJECT IDENTIFIER, critical BOOLEAN DEFAULT FALSE, value OCTET STRING
//   }
//
//   2.5.29.19  basic constraints     SEQUENCE { CA BOOLEAN DEFAULT FALSE, path length INTEGER OPTIONAL }
//   2.5.29.15  key usage             BIT STRING, the unused bits zero
//   2.5.29.37  purposes              SEQUENCE OF OBJECT IDENTIFIER
//   2.5.29.17  alternative names     SEQUENCE OF GeneralName (general_name.h)
//   2.5.29.30  name constraints      name_constraints.h
//   2.5.29.32  certificate policies  SEQUENCE OF SEQUENCE { OBJECT IDENTIFIER, qualifiers SEQUENCE OPTIONAL }
//   2.5.29.14  key identifier        OCTET STRING
//   2.5.29.35  the issuer's          SEQUENCE { [0] OCTET STRING OPTIONAL, [1] names, [2] serial number }
//
// An extension with another value is malformed, and so is one that occurs twice.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/bytes.h"
#include "trust/name_constraints.h"

namespace pinwell::trust {

/// A certificate with more extensions is refused. Real certificates have fewer than 20.
inline constexpr std::size_t kMaximumExtensions = 256;

struct BasicConstraints {
    bool isCertificateAuthority = false;
    std::optional<std::uint64_t> pathLength;
};

/// Bits of the key usage extension, as it numbers them.
inline constexpr std::uint32_t kKeyUsageDigitalSignature = 1U << 0U;
inline constexpr std::uint32_t kKeyUsageKeyEncipherment = 1U << 2U;
inline constexpr std::uint32_t kKeyUsageCertificateSigning = 1U << 5U;

/// The known purposes in the extended key usage; others are not kept.
struct Purposes {
    bool serverAuthentication = false;  // 1.3.6.1.5.5.7.3.1
    bool any = false;                   // 2.5.29.37.0
};

/// A missing or unreadable extension has no value here; an unreadable one is also listed as
/// malformed.
struct CertificateExtensions {
    struct Entry {
        std::string oid;  // dotted
        bool critical = false;
    };

    std::vector<Entry> entries;
    std::vector<std::string> malformed;  // OIDs of unreadable or repeated extensions

    std::optional<BasicConstraints> basicConstraints;
    std::optional<std::uint32_t> keyUsage;           // a malformed one permits nothing
    std::optional<Purposes> purposes;                // a malformed one names nothing
    std::optional<NameConstraints> nameConstraints;  // a malformed one permits nothing
    std::optional<AlternativeNames> alternativeNames;
    std::optional<base::Data> subjectKeyIdentifier;
    std::optional<base::Data> authorityKeyIdentifier;

    bool carries(std::string_view oid) const;
};

inline constexpr std::string_view kNameConstraintsOid = "2.5.29.30";

/// Whether the checks know the extension with this OID, so that it may be critical. Name constraints are
/// known if they are applied.
bool isUnderstoodExtension(std::string_view oid, bool appliesNameConstraints);

/// `contents` are the contents of the SEQUENCE. Throws der::Malformed if it is not a list of extensions, is
/// empty, or has too many.
CertificateExtensions readExtensions(base::ByteView contents);

}  // namespace pinwell::trust
