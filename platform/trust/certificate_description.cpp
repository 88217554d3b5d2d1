#include "trust/certificate_description.h"

#include <algorithm>

#include "base/text.h"
#include "crypto/crypto.h"
#include "crypto/openssl.h"
#include "trust/certificate.h"

namespace pinwell::trust {
namespace {

using crypto::BioHandle;
using crypto::NameHandle;
using crypto::ObjectHandle;

/// The text of a name that `readName` accepts, so its parts are well-formed and bounded in number.
std::string nameText(const der::Element& encoded) {
    const unsigned char* at = crypto::unsignedBytes(encoded.whole);
    const NameHandle name(d2i_X509_NAME(nullptr, &at, static_cast<long>(encoded.whole.size())));
    const BioHandle text(BIO_new(BIO_s_mem()));
    // UTF-8 stays readable; terminal control characters are escaped.
    const unsigned long flags = (XN_FLAG_RFC2253 & ~ASN1_STRFLGS_ESC_MSB) | ASN1_STRFLGS_ESC_CTRL;
    if (!name || !text || X509_NAME_print_ex(text.get(), name.get(), 0, flags) < 0) return {};
    return crypto::textOf(text.get());
}

/// The magnitude of a number in two's complement.
base::Data negated(base::ByteView number) {
    base::Data result = base::toData(number);
    bool carry = true;
    for (auto byte = result.rbegin(); byte != result.rend(); ++byte) {
        *byte = ~*byte;
        if (!carry) continue;
        *byte = static_cast<std::byte>(std::to_integer<unsigned>(*byte) + 1U);
        carry = *byte == std::byte{0};
    }
    return result;
}

/// The text of an INTEGER's contents, which are not empty.
std::string serialText(base::ByteView number) {
    const bool isNegative = (number.front() & std::byte{0x80}) != std::byte{0};
    const base::Data magnitude = isNegative ? negated(number) : base::toData(number);
    const auto first =
        std::find_if(magnitude.begin(), magnitude.end(), [](std::byte byte) { return byte != std::byte{0}; });
    if (first == magnitude.end()) return "00";
    return (isNegative ? "-" : "") + base::toHex({first, magnitude.end()});
}

/// OpenSSL's long name of an identifier, of bounded length; the identifier itself if it has none.
std::string oidName(const std::string& oid) {
    const ObjectHandle object(OBJ_txt2obj(oid.c_str(), 1));
    const int number = object ? OBJ_obj2nid(object.get()) : NID_undef;
    const char* const name = number == NID_undef ? nullptr : OBJ_nid2ln(number);
    return name == nullptr ? oid : name;
}

void describeKey(const X509Certificate& certificate, CertificateDescription& into) {
    const auto& key = certificate.publicKey();
    if (key == nullptr) return;
    into.keyType = key->type();
    if (into.keyType.empty()) {
        const char* const name = EVP_PKEY_get0_type_name(key->native());
        into.keyType = name == nullptr ? "unknown" : name;
    }
    into.keyBits = static_cast<int>(key->bits());
    into.curve = key->curve();
}

void describeExtensions(const CertificateExtensions& extensions, CertificateDescription& into) {
    const auto& malformed = extensions.malformed;
    for (const auto& [oid, critical] : extensions.entries) {
        const bool unreadable = std::find(malformed.begin(), malformed.end(), oid) != malformed.end();
        into.extensions.push_back({oid, critical, unreadable});
    }
    into.isCertificateAuthority =
        extensions.basicConstraints && extensions.basicConstraints->isCertificateAuthority;
    into.subjectKeyIdentifier = extensions.subjectKeyIdentifier;
    into.authorityKeyIdentifier = extensions.authorityKeyIdentifier;
}

}  // namespace

std::optional<CertificateDescription> describeCertificate(base::ByteView der) {
    const X509CertificateRef certificate = X509Certificate::parse(der);
    if (certificate == nullptr) return std::nullopt;
    const crypto::ErrorQueueGuard guard;
    const CertificateParts& parts = certificate->parts();
    CertificateDescription description;
    description.subject = nameText(parts.subject);
    description.issuer = nameText(parts.issuer);
    description.summary = certificate->subjectSummary();
    description.serialNumber = serialText(parts.serialNumber);
    description.notBefore = certificate->notBefore();
    description.notAfter = certificate->notAfter();
    describeKey(*certificate, description);
    description.signatureAlgorithm = oidName(certificate->signatureAlgorithm().oid);
    description.isSelfIssued = certificate->isSelfIssued();
    describeExtensions(certificate->extensions(), description);
    description.sha1Fingerprint = crypto::availableDigestOf(crypto::Digest::sha1, der).value_or(base::Data());
    description.sha256Fingerprint =
        crypto::availableDigestOf(crypto::Digest::sha256, der).value_or(base::Data());
    return description;
}

}  // namespace pinwell::trust
