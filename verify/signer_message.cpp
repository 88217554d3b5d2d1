#include "verify/signer_message.h"

#include <algorithm>
#include <array>
#include <string_view>
#include <vector>

#include "codesign/cms_message.h"
#include "codesign/cms_signature.h"
#include "codesign/code_error.h"
#include "trust/certificate.h"
#include "trust/der.h"
#include "trust/signature_algorithm.h"

namespace pinwell::verify {

using base::asBytes;
using base::ByteView;
using base::Data;
using codesign::MessageCertificate;
using codesign::refuse;
using codesign::SignedMessage;
using trust::X509Certificate;
using trust::X509CertificateRef;

namespace {

constexpr std::string_view kPlainData = "\x2A\x86\x48\x86\xF7\x0D\x01\x07\x01";  // 1.2.840.113549.1.7.1
constexpr std::string_view kTimeStampToken =
    "\x2A\x86\x48\x86\xF7\x0D\x01\x09\x10\x02\x0E";                           // 1.2.840.113549.1.9.16.2.14
constexpr std::string_view kRsaKey = "\x2A\x86\x48\x86\xF7\x0D\x01\x01\x01";  // 1.2.840.113549.1.1.1
constexpr std::string_view kEcKey = "\x2A\x86\x48\xCE\x3D\x02\x01";           // 1.2.840.10045.2.1
constexpr std::string_view kPss = "\x2A\x86\x48\x86\xF7\x0D\x01\x01\x0A";     // 1.2.840.113549.1.1.10
constexpr std::string_view kNull{"\x05\x00", 2};

/// Digests by their names in signature algorithms (trust/signature_algorithm.h).
struct NamedDigest {
    std::string_view identifier;
    std::string_view name;
};
constexpr std::array kDigests{
    NamedDigest{"\x2A\x86\x48\x86\xF7\x0D\x02\x05", "MD5"},
    NamedDigest{"\x2B\x0E\x03\x02\x1A", "SHA1"},
    NamedDigest{"\x60\x86\x48\x01\x65\x03\x04\x02\x01", "SHA256"},
    NamedDigest{"\x60\x86\x48\x01\x65\x03\x04\x02\x02", "SHA384"},
    NamedDigest{"\x60\x86\x48\x01\x65\x03\x04\x02\x03", "SHA512"},
    NamedDigest{"\x60\x86\x48\x01\x65\x03\x04\x02\x04", "SHA224"},
};

bool is(ByteView identifier, std::string_view known) {
    return std::ranges::equal(identifier, asBytes(known));
}

void requirePlainParameters(const codesign::Algorithm& algorithm) {
    if (!algorithm.parameters.empty() && !is(algorithm.parameters, kNull))
        refuse("an algorithm of the signer's message has parameters that nothing reads");
}

bool isOfDigest(std::string_view name, ByteView identifier) {
    return std::ranges::any_of(kDigests, [&](const NamedDigest& digest) {
        return digest.name == name && is(identifier, digest.identifier);
    });
}

/// The key's own algorithm names no digest; any other must name the used one.
void requireSignatureAlgorithm(const SignedMessage& message) {
    const codesign::Algorithm& algorithm = message.signer.signatureAlgorithm;
    if (is(algorithm.identifier, kPss)) return;  // verification uses its parameters
    requirePlainParameters(algorithm);
    if (is(algorithm.identifier, kRsaKey) || is(algorithm.identifier, kEcKey)) return;
    Data element = codesign::ber::makeElement(codesign::ber::kObjectIdentifier, algorithm.identifier);
    const trust::SignatureAlgorithm named = trust::readSignatureAlgorithm(element);
    if (!isOfDigest(named.digest.name, message.signer.digestAlgorithm.identifier))
        refuse("the signature's algorithm is not of the signer's digest");
}

void requireForm(const SignedMessage& message) {
    const bool isByName = !message.signer.keyIdentifier;
    if (message.signer.version != (isByName ? 1 : 3)) refuse("the signer in the message has a wrong version");
    // Older signers write 1 throughout.
    const int stated = is(message.contentType, kPlainData) && isByName ? 1 : 3;
    if (message.version != stated && message.version != 1) refuse("the signer's message has a wrong version");
    if (message.digestAlgorithms.size() != 1)
        refuse("the signer's message lists algorithms that nothing uses");
    requirePlainParameters(message.digestAlgorithms.front());
    requirePlainParameters(message.signer.digestAlgorithm);
    requireSignatureAlgorithm(message);
    if (message.hasRevocationLists) refuse("the signer's message has revocation lists, which nothing covers");
    if (message.otherCertificates > 0) refuse("the signer's message has certificates that nothing reads");
}

std::vector<X509CertificateRef> certificatesIn(const SignedMessage& message) {
    std::vector<X509CertificateRef> certificates;
    for (const MessageCertificate& one : message.certificates) {
        X509CertificateRef certificate = X509Certificate::parse(one.whole);
        if (!certificate) refuse("a certificate in the signer's message is malformed");
        certificates.push_back(std::move(certificate));
    }
    return certificates;
}

/// Refuses if the message has the issuer by its key identifier, although not by its name.
void requireNoIssuerByKey(const std::vector<X509CertificateRef>& all, const X509Certificate& subject) {
    const std::optional<Data>& wanted = subject.extensions().authorityKeyIdentifier;
    if (wanted && std::ranges::any_of(all, [&](const X509CertificateRef& one) {
            return one->extensions().subjectKeyIdentifier == wanted;
        }))
        refuse("a certificate in the signer's message does not name its issuer");
}

/// Follows the chain from the certificate at `signer`. Returns the number of certificates without an issuer
/// at its end.
std::size_t requireChain(const std::vector<X509CertificateRef>& all, std::size_t signer) {
    std::vector<bool> counts(all.size());
    std::vector<std::size_t> pending{signer};
    counts[signer] = true;
    std::size_t withoutIssuer = 0;
    while (!pending.empty()) {
        const X509Certificate& subject = *all[pending.back()];
        pending.pop_back();
        bool hasIssuer = false;
        bool isVerified = false;
        for (std::size_t i = 0; i < all.size(); ++i) {
            if (!all[i]->isNamedAsIssuerOf(subject)) continue;
            hasIssuer = true;
            if (!all[i]->verifiesSignatureOf(subject)) continue;
            isVerified = true;
            if (!counts[i]) pending.push_back(i);
            counts[i] = true;
        }
        if (hasIssuer && !isVerified)
            refuse("a certificate in the signer's message is not what its issuer has signed");
        if (hasIssuer) continue;
        requireNoIssuerByKey(all, subject);
        ++withoutIssuer;
    }
    if (std::ranges::find(counts, false) != counts.end())
        refuse("the signer's message has a certificate that is not in the signer's chain");
    return withoutIssuer;
}

/// The position of the signer's certificate: the first one that the signer names, as in codesign.
std::size_t placeOfSigner(const SignedMessage& message, const std::vector<X509CertificateRef>& certificates) {
    const codesign::MessageSigner& signer = message.signer;
    for (std::size_t i = 0; i < certificates.size(); ++i) {
        const MessageCertificate& one = message.certificates[i];
        const bool isSigners = signer.keyIdentifier
                                   ? one.keyIdentifier == signer.keyIdentifier
                                   : std::ranges::equal(one.serialNumber, signer.serialNumber) &&
                                         std::ranges::equal(one.issuer, signer.issuer);
        if (isSigners) return i;
    }
    refuse("the signer in the message is not named as its certificate is");
}

std::size_t requireCertificates(const SignedMessage& message) {
    const std::vector<X509CertificateRef> certificates = certificatesIn(message);
    return requireChain(certificates, placeOfSigner(message, certificates));
}

/// Checks the parts of a message that its signature does not cover.
SignerMessage requireRest(const SignedMessage& message) {
    requireForm(message);
    return {.hasTimestamp = false, .certificatesWithoutIssuer = requireCertificates(message)};
}

}  // namespace

SignerMessage requireSignerMessage(ByteView bytes, ByteView content) {
    codesign::requireDetachedCms(bytes, content);
    const SignedMessage message = codesign::parseSignedMessage(bytes);
    try {
        SignerMessage found = requireRest(message);
        if (!message.signer.unsignedAttributes) return found;
        constexpr const char* kWhere = "the unsigned attributes";
        const codesign::ber::Element& attributes = *message.signer.unsignedAttributes;
        if (codesign::hasAttributeBeside(attributes, asBytes(kTimeStampToken), kWhere))
            refuse("the signer's message has an unsigned attribute that nothing covers");
        const auto token = codesign::soleValueOf(attributes, asBytes(kTimeStampToken), kWhere);
        if (!token || !codesign::secureTimestamp(bytes)) refuse("the time stamp does not verify");
        found.hasTimestamp = true;
        found.certificatesWithoutIssuer +=
            requireRest(codesign::parseSignedMessage(token->whole)).certificatesWithoutIssuer;
        return found;
    } catch (const trust::der::Malformed&) {
        refuse("an algorithm of the signer's message is malformed");
    }
}

}  // namespace pinwell::verify
