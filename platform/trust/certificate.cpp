#include "trust/certificate.h"

#include <algorithm>

#include "base/text.h"
#include "crypto/crypto.h"
#include "trust/der.h"

namespace pinwell::trust {

namespace {

using base::ByteView;
using der::contextTag;
using der::Cursor;
using der::Element;
using der::Malformed;

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

namespace {

/// SHA-1 of the key's bits identifies a key without an identifier (RFC 5280, 4.2.1.2). Nothing relies on it
/// for security.
std::string keyIdentifier(ByteView subjectKey, const CertificateExtensions& extensions) {
    if (extensions.subjectKeyIdentifier) return base::toHex(*extensions.subjectKeyIdentifier);
    der::Cursor cursor(subjectKey);
    cursor.take(der::kConstructedSequence);
    const ByteView bits = der::wholeBytes(cursor.take(der::kBitString).contents);
    return base::toHex(crypto::availableDigestOf(crypto::Digest::sha1, bits).value_or(Data()));
}

}  // namespace

void X509Certificate::read() {
    parts_ = readCertificateParts(der_);
    subject_ = readName(parts_.subject.contents);
    issuer_ = readName(parts_.issuer.contents);
    algorithm_ = readSignatureAlgorithm(parts_.outerAlgorithm);
    readSignatureAlgorithm(parts_.innerAlgorithm);
    algorithmsAgree_ = std::ranges::equal(parts_.innerAlgorithm, parts_.outerAlgorithm);
    subjectKey_ = readSubjectKey(parts_.subjectKey);
    if (parts_.extensions) extensions_ = readExtensions(*parts_.extensions);
    const std::string text =
        subject_.summary.empty() ? keyIdentifier(parts_.subjectKey, extensions_) : subject_.summary;
    // Escaped here: every use is a text for people, and the text comes from the certificate's maker.
    summary_ = base::escapeForTerminal(text);
}

X509CertificateRef X509Certificate::parse(ByteView der) {
    if (der.size() > kMaximumCertificateSize) return nullptr;
    const std::shared_ptr<X509Certificate> result(new X509Certificate(base::toData(der)));
    try {
        result->read();
    } catch (const der::Malformed&) {
        return nullptr;
    }
    return result;
}

const std::shared_ptr<const X509PublicKey>& X509Certificate::publicKey() const {
    std::call_once(keyMade_, [this] { publicKey_ = X509PublicKey::make(subjectKey_); });
    return publicKey_;
}

bool X509Certificate::isNamedAsIssuerOf(const X509Certificate& other) const {
    return subject_.canonical == other.issuer_.canonical;
}

bool X509Certificate::verifiesSignatureOf(const X509Certificate& other) const {
    if (!other.algorithmsAgree_) return false;
    const auto& key = publicKey();
    return key != nullptr && key->verifies(other.algorithm_, other.parts_.signedPart, other.parts_.signature);
}

bool X509Certificate::hasSameSubjectAndKeyAs(const X509Certificate& other) const {
    return subject_.canonical == other.subject_.canonical &&
           subjectKey_.identity == other.subjectKey_.identity;
}

}  // namespace pinwell::trust
