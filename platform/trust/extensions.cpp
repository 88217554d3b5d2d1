#include "trust/extensions.h"

#include <algorithm>
#include <array>
#include <set>

#include "trust/der.h"

namespace pinwell::trust {
namespace {

using base::ByteView;
using der::Cursor;
using der::Element;
using der::Malformed;

constexpr std::string_view kSubjectKeyIdentifierOid = "2.5.29.14";
constexpr std::string_view kKeyUsageOid = "2.5.29.15";
constexpr std::string_view kAlternativeNamesOid = "2.5.29.17";
constexpr std::string_view kBasicConstraintsOid = "2.5.29.19";
constexpr std::string_view kCertificatePoliciesOid = "2.5.29.32";
constexpr std::string_view kAuthorityKeyIdentifierOid = "2.5.29.35";
constexpr std::string_view kPurposesOid = "2.5.29.37";

constexpr std::string_view kServerAuthenticationPurpose = "1.3.6.1.5.5.7.3.1";
constexpr std::string_view kAnyPurpose = "2.5.29.37.0";

/// The contents of the SEQUENCE that fills the value.
Cursor enterSequence(ByteView value) {
    Cursor outer(value);
    const Cursor inner = outer.enter(der::kConstructedSequence);
    outer.expectEnd();
    return inner;
}

void readBasicConstraints(ByteView value, CertificateExtensions& into) {
    Cursor fields = enterSequence(value);
    BasicConstraints constraints;
    if (!fields.atEnd() && der::readElement(fields.rest())->tag == der::kBoolean)
        constraints.isCertificateAuthority = fields.boolean();
    if (!fields.atEnd()) {
        const ByteView length = fields.naturalNumber();
        if (length.size() > sizeof(std::uint64_t)) throw Malformed("a path length is out of range");
        constraints.pathLength = 0;
        for (const std::byte byte : length)
            constraints.pathLength = (*constraints.pathLength << 8U) | std::to_integer<std::uint64_t>(byte);
    }
    fields.expectEnd();
    into.basicConstraints = constraints;
}

void readKeyUsage(ByteView value, CertificateExtensions& into) {
    into.keyUsage = 0;
    Cursor outer(value);
    const ByteView bytes = der::bitString(outer.take(der::kBitString).contents);
    outer.expectEnd();
    std::uint32_t usage = 0;
    constexpr std::uint32_t kBits = 9;  // digitalSignature (0) to decipherOnly (8)
    std::uint32_t bit = 0;
    for (const std::byte byte : bytes.first(std::min<std::size_t>(bytes.size(), (kBits + 7) / 8))) {
        for (unsigned mask = 0x80; mask != 0 && bit < kBits; mask >>= 1U, ++bit)
            if ((std::to_integer<unsigned>(byte) & mask) != 0) usage |= 1U << bit;
    }
    into.keyUsage = usage;
}

void readPurposes(ByteView value, CertificateExtensions& into) {
    into.purposes.emplace();
    Purposes purposes;
    for (Cursor list = enterSequence(value); !list.atEnd();) {
        const std::string oid = list.oid();
        purposes.serverAuthentication = purposes.serverAuthentication || oid == kServerAuthenticationPurpose;
        purposes.any = purposes.any || oid == kAnyPurpose;
    }
    into.purposes = purposes;
}

void readAlternativeNames(ByteView value, CertificateExtensions& into) {
    AlternativeNames names;
    for (Cursor list = enterSequence(value); !list.atEnd();) {
        const GeneralName name = readGeneralName(list.any());
        if (name.form == GeneralNameForm::dnsName) {
            names.dnsNames.push_back(base::toString(name.contents));
        } else if (name.form == GeneralNameForm::address) {
            if (name.contents.size() != 4 && name.contents.size() != 16)
                throw Malformed("an address is of no known length");
            names.addresses.push_back(base::toData(name.contents));
        }
    }
    into.alternativeNames = std::move(names);
}

void readConstraints(ByteView value, CertificateExtensions& into) {
    into.nameConstraints.emplace().hasUnhandledForm = true;
    into.nameConstraints = readNameConstraints(value);
}

/// A certificate's policies have no effect, because we require none (RFC 5280, 4.2.1.4).
void readCertificatePolicies(ByteView value, CertificateExtensions&) {
    Cursor list = enterSequence(value);
    do {  // at least one
        Cursor policy = list.enter(der::kConstructedSequence);
        policy.oid();
        policy.takeIf(der::kConstructedSequence);
        policy.expectEnd();
    } while (!list.atEnd());
}

void readSubjectKeyIdentifier(ByteView value, CertificateExtensions& into) {
    Cursor outer(value);
    const ByteView identifier = outer.take(der::kOctetString).contents;
    outer.expectEnd();
    into.subjectKeyIdentifier = base::toData(identifier);
}

void readAuthorityKeyIdentifier(ByteView value, CertificateExtensions& into) {
    Cursor fields = enterSequence(value);
    const std::optional<Element> identifier = fields.takeIf(der::contextTag(0, false));
    const std::optional<Element> issuer = fields.takeIf(der::contextTag(1, true));
    const std::optional<Element> serial = fields.takeIf(der::contextTag(2, false));
    fields.expectEnd();
    if (issuer) {
        for (Cursor names(issuer->contents); !names.atEnd();) readGeneralName(names.any());
    }
    if (serial) der::checkInteger(serial->contents);
    if (identifier) into.authorityKeyIdentifier = base::toData(identifier->contents);
}

struct Reader {
    std::string_view oid;
    void (*read)(ByteView value, CertificateExtensions& into);  // throws Malformed
};
constexpr std::array kExtensionReaders{
    Reader{kBasicConstraintsOid, readBasicConstraints},
    Reader{kKeyUsageOid, readKeyUsage},
    Reader{kPurposesOid, readPurposes},
    Reader{kAlternativeNamesOid, readAlternativeNames},
    Reader{kNameConstraintsOid, readConstraints},
    Reader{kCertificatePoliciesOid, readCertificatePolicies},
    Reader{kSubjectKeyIdentifierOid, readSubjectKeyIdentifier},
    Reader{kAuthorityKeyIdentifierOid, readAuthorityKeyIdentifier},
};

const Reader* readerFor(std::string_view oid) {
    const auto* const found = std::find_if(kExtensionReaders.begin(), kExtensionReaders.end(),
                                           [&](const Reader& reader) { return reader.oid == oid; });
    return found == kExtensionReaders.end() ? nullptr : found;
}

bool isReadable(const Reader& reader, ByteView value, CertificateExtensions& into) {
    try {
        reader.read(value, into);
        return true;
    } catch (const Malformed&) {
        return false;
    }
}

}  // namespace

bool CertificateExtensions::carries(std::string_view oid) const {
    return std::any_of(entries.begin(), entries.end(), [&](const Entry& entry) { return entry.oid == oid; });
}

bool isUnderstoodExtension(std::string_view oid, bool appliesNameConstraints) {
    if (oid == kNameConstraintsOid) return appliesNameConstraints;
    return readerFor(oid) != nullptr;
}

CertificateExtensions readExtensions(ByteView contents) {
    CertificateExtensions result;
    std::set<std::string, std::less<>> seen;
    Cursor list(contents);
    do {  // at least one
        if (result.entries.size() == kMaximumExtensions) throw Malformed("there are too many extensions");
        Cursor extension = list.enter(der::kConstructedSequence);
        CertificateExtensions::Entry entry{extension.oid(), false};
        if (const auto next = der::readElement(extension.rest()); next && next->tag == der::kBoolean)
            entry.critical = extension.boolean();
        const ByteView value = extension.take(der::kOctetString).contents;
        extension.expectEnd();

        const Reader* const reader = readerFor(entry.oid);
        const bool isFirst = seen.insert(entry.oid).second;  // RFC 5280, 4.2: not more than once
        if (!isFirst || (reader != nullptr && !isReadable(*reader, value, result)))
            result.malformed.push_back(entry.oid);
        result.entries.push_back(std::move(entry));
    } while (!list.atEnd());
    return result;
}

}  // namespace pinwell::trust
