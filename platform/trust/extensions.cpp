#include "trust/extensions.h"

#include <algorithm>
#include <array>
#include <set>

#include "trust/der.h"
#include "trust/openssl.h"

namespace pinwell::trust {
namespace {

using foundation::ByteView;
using foundation::Data;

constexpr std::string_view kSubjectKeyIdentifierOid = "2.5.29.14";
constexpr std::string_view kKeyUsageOid = "2.5.29.15";
constexpr std::string_view kAlternativeNamesOid = "2.5.29.17";
constexpr std::string_view kBasicConstraintsOid = "2.5.29.19";
constexpr std::string_view kAuthorityKeyIdentifierOid = "2.5.29.35";
constexpr std::string_view kPurposesOid = "2.5.29.37";

std::string dottedOid(const ASN1_OBJECT* object) {
    std::array<char, 128> text{};
    const int length = OBJ_obj2txt(text.data(), static_cast<int>(text.size()), object, 1);
    if (length <= 0) return {};
    if (static_cast<std::size_t>(length) < text.size())
        return {text.data(), static_cast<std::size_t>(length)};
    std::string whole(static_cast<std::size_t>(length) + 1, '\0');
    OBJ_obj2txt(whole.data(), length + 1, object, 1);
    whole.pop_back();
    return whole;
}

/// The extension decoded by OpenSSL; null when it cannot be, or when bytes follow its value, which OpenSSL
/// ignores.
template <class T, auto release>
Handle<T, release> decode(X509_EXTENSION* extension) {
    const ByteView value = byteView(X509_EXTENSION_get_data(extension));
    const std::optional<der::Element> element = der::readElement(value);
    if (!element || element->whole.size() != value.size()) return nullptr;
    return Handle<T, release>(static_cast<T*>(X509V3_EXT_d2i(extension)));
}

bool readBasicConstraints(X509_EXTENSION* extension, CertificateExtensions& into) {
    const auto decoded = decode<BASIC_CONSTRAINTS, BASIC_CONSTRAINTS_free>(extension);
    if (!decoded) return false;
    BasicConstraints constraints{decoded->ca != 0, std::nullopt};
    if (decoded->pathlen != nullptr) {
        std::uint64_t length = 0;
        if (ASN1_INTEGER_get_uint64(&length, decoded->pathlen) != 1)
            return false;  // negative, or out of range
        constraints.pathLength = length;
    }
    into.basicConstraints = constraints;
    return true;
}

bool readKeyUsage(X509_EXTENSION* extension, CertificateExtensions& into) {
    into.keyUsage = 0;
    const auto decoded = decode<ASN1_BIT_STRING, ASN1_BIT_STRING_free>(extension);
    if (!decoded) return false;
    constexpr int kBits = 9;  // digitalSignature (0) to decipherOnly (8)
    for (int bit = 0; bit < kBits; ++bit) {
        if (ASN1_BIT_STRING_get_bit(decoded.get(), bit) == 1)
            *into.keyUsage |= 1U << static_cast<unsigned>(bit);
    }
    return true;
}

void freePurposes(EXTENDED_KEY_USAGE* purposes) {
    sk_ASN1_OBJECT_pop_free(purposes, ASN1_OBJECT_free);
}

bool readPurposes(X509_EXTENSION* extension, CertificateExtensions& into) {
    const auto decoded = decode<EXTENDED_KEY_USAGE, freePurposes>(extension);
    if (!decoded) return false;
    std::vector<std::string> purposes;
    for (int i = 0; i < sk_ASN1_OBJECT_num(decoded.get()); ++i) {
        purposes.push_back(dottedOid(sk_ASN1_OBJECT_value(decoded.get(), i)));
    }
    into.purposes = std::move(purposes);
    return true;
}

bool readAlternativeNames(X509_EXTENSION* extension, CertificateExtensions& into) {
    const auto decoded = decode<GENERAL_NAMES, GENERAL_NAMES_free>(extension);
    if (!decoded) return false;
    AlternativeNames names;
    for (int i = 0; i < sk_GENERAL_NAME_num(decoded.get()); ++i) {
        const GENERAL_NAME* const name = sk_GENERAL_NAME_value(decoded.get(), i);
        if (name->type == GEN_DNS) {
            names.dnsNames.push_back(foundation::toString(byteView(name->d.dNSName)));
        } else if (name->type == GEN_IPADD) {
            const ByteView address = byteView(name->d.iPAddress);
            if (address.size() != 4 && address.size() != 16) return false;
            names.addresses.push_back(foundation::toData(address));
        }
    }
    into.alternativeNames = std::move(names);
    return true;
}

bool readSubjectKeyIdentifier(X509_EXTENSION* extension, CertificateExtensions& into) {
    const auto decoded = decode<ASN1_OCTET_STRING, ASN1_OCTET_STRING_free>(extension);
    if (!decoded) return false;
    into.subjectKeyIdentifier = foundation::toData(byteView(decoded.get()));
    return true;
}

bool readAuthorityKeyIdentifier(X509_EXTENSION* extension, CertificateExtensions& into) {
    const auto decoded = decode<AUTHORITY_KEYID, AUTHORITY_KEYID_free>(extension);
    if (!decoded) return false;
    if (decoded->keyid != nullptr) into.authorityKeyIdentifier = foundation::toData(byteView(decoded->keyid));
    return true;
}

struct Reader {
    std::string_view oid;
    bool (*read)(X509_EXTENSION*, CertificateExtensions&);
};
constexpr std::array kExtensionReaders{
    Reader{kBasicConstraintsOid, readBasicConstraints},
    Reader{kKeyUsageOid, readKeyUsage},
    Reader{kPurposesOid, readPurposes},
    Reader{kAlternativeNamesOid, readAlternativeNames},
    Reader{kSubjectKeyIdentifierOid, readSubjectKeyIdentifier},
    Reader{kAuthorityKeyIdentifierOid, readAuthorityKeyIdentifier},
};

const Reader* readerFor(std::string_view oid) {
    const auto* const found = std::find_if(kExtensionReaders.begin(), kExtensionReaders.end(),
                                           [&](const Reader& reader) { return reader.oid == oid; });
    return found == kExtensionReaders.end() ? nullptr : found;
}

}  // namespace

bool CertificateExtensions::carries(std::string_view oid) const {
    return std::any_of(entries.begin(), entries.end(), [&](const Entry& entry) { return entry.oid == oid; });
}

bool isUnderstoodExtension(std::string_view oid) {
    return readerFor(oid) != nullptr;
}

CertificateExtensions readExtensions(const X509* certificate) {
    CertificateExtensions result;
    std::set<std::string, std::less<>> seen;
    for (int i = 0; i < X509_get_ext_count(certificate); ++i) {
        X509_EXTENSION* const extension = X509_get_ext(certificate, i);
        std::string oid = dottedOid(X509_EXTENSION_get_object(extension));
        if (!seen.insert(oid).second) {
            result.malformed.push_back(oid);  // RFC 5280, 4.2: not more than once; the first one stays
        } else if (const Reader* const reader = readerFor(oid); reader != nullptr) {
            if (!reader->read(extension, result)) result.malformed.push_back(oid);
        }
        result.entries.push_back({std::move(oid), X509_EXTENSION_get_critical(extension) == 1});
    }
    return result;
}

}  // namespace pinwell::trust
