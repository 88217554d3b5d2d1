#include "trust/certificate_grammar.h"

#include "trust/der.h"

namespace pinwell::trust {
namespace {

using der::contextTag;
using der::Cursor;
using der::Element;
using der::Malformed;
using foundation::ByteView;

enum Version { kVersion1 = 1, kVersion2 = 2, kVersion3 = 3 };

Version readVersion(Cursor& body) {
    const std::optional<Element> field = body.takeIf(contextTag(0, true));
    if (!field) return kVersion1;
    Cursor inner(field->contents);
    const ByteView number = inner.naturalNumber();
    inner.expectEnd();
    if (number.size() == 1 && number.front() == std::byte{1}) return kVersion2;
    if (number.size() == 1 && number.front() == std::byte{2}) return kVersion3;
    throw Malformed("there is no such version");
}

void readValidity(Cursor validity, CertificateParts& parts) {
    parts.notBefore = der::readTime(validity.any());
    parts.notAfter = der::readTime(validity.any());
    validity.expectEnd();
}

/// The tag replaces that of BIT STRING: the contents are the same.
void skipUniqueIdentifier(Cursor& body, std::uint32_t number, Version version) {
    const std::optional<Element> identifier = body.takeIf(contextTag(number, false));
    if (!identifier) return;
    if (version == kVersion1) throw Malformed("version 1 has no unique identifiers");
    der::bitString(identifier->contents);
}

void readSignedPart(Cursor body, CertificateParts& parts) {
    const Version version = readVersion(body);
    parts.serialNumber = body.take(der::kInteger).contents;
    der::checkInteger(parts.serialNumber);
    parts.innerAlgorithm = body.take(der::kConstructedSequence).contents;
    parts.issuer = body.take(der::kConstructedSequence);
    readValidity(body.enter(der::kConstructedSequence), parts);
    parts.subject = body.take(der::kConstructedSequence);
    parts.subjectKey = body.take(der::kConstructedSequence).contents;
    skipUniqueIdentifier(body, 1, version);
    skipUniqueIdentifier(body, 2, version);
    if (const std::optional<Element> field = body.takeIf(contextTag(3, true))) {
        if (version != kVersion3) throw Malformed("version 3 alone has extensions");
        Cursor inner(field->contents);
        parts.extensions = inner.take(der::kConstructedSequence).contents;
        inner.expectEnd();
    }
    body.expectEnd();
}

}  // namespace

CertificateParts readCertificateParts(ByteView certificate) {
    if (certificate.size() > kMaximumCertificateSize) throw Malformed("the certificate is too long");
    Cursor outer(certificate);
    Cursor whole = outer.enter(der::kConstructedSequence);
    outer.expectEnd();
    if (!der::isNestedDefinite(whole.rest(), der::kMaximumNesting - 1))
        throw Malformed("an element inside the certificate is malformed, or too deep");

    CertificateParts parts;
    const Element signedPart = whole.take(der::kConstructedSequence);
    parts.signedPart = signedPart.whole;
    parts.outerAlgorithm = whole.take(der::kConstructedSequence).contents;
    parts.signature = der::wholeBytes(whole.take(der::kBitString).contents);
    whole.expectEnd();
    readSignedPart(Cursor(signedPart.contents), parts);
    return parts;
}

}  // namespace pinwell::trust
