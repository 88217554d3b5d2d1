#include "codesign/cms_signature.h"

#include <openssl/x509.h>

#include <algorithm>
#include <string_view>

#include "codesign/cms_message.h"
#include "codesign/code_error.h"
#include "codesign/signer_key.h"
#include "codesign/time_stamp.h"
#include "trust/openssl.h"

namespace pinwell::codesign {

using foundation::asBytes;
using foundation::ByteView;
using foundation::Data;
using foundation::Date;
using trust::ErrorQueueGuard;
using trust::unsignedBytes;

namespace {

using Name = foundation::Handle<X509_NAME, X509_NAME_free>;

constexpr const char* kSignedAttributes = "the signed attributes";
constexpr const char* kUnsignedAttributes = "the unsigned attributes";

constexpr std::string_view kPlainData = "\x2A\x86\x48\x86\xF7\x0D\x01\x07\x01";  // 1.2.840.113549.1.7.1
constexpr std::string_view kContentTypeAttribute = "\x2A\x86\x48\x86\xF7\x0D\x01\x09\x03";    // ....1.9.3
constexpr std::string_view kMessageDigestAttribute = "\x2A\x86\x48\x86\xF7\x0D\x01\x09\x04";  // ....1.9.4
constexpr std::string_view kTimeStampContent =
    "\x2A\x86\x48\x86\xF7\x0D\x01\x09\x10\x01\x04";  // 1.2.840.113549.1.9.16.1.4
constexpr std::string_view kTimeStampTokenAttribute =
    "\x2A\x86\x48\x86\xF7\x0D\x01\x09\x10\x02\x0E";  // 1.2.840.113549.1.9.16.2.14

/// Longest name that is compared by its contents, not byte by byte. Names in certificates take some 100
/// bytes.
constexpr std::size_t kMaximumNameSize = 4096;

Name parseName(ByteView bytes) {
    const unsigned char* cursor = unsignedBytes(bytes);
    return Name(d2i_X509_NAME(nullptr, &cursor, static_cast<long>(bytes.size())));
}

// A name may have other string types in the message than in the certificate.
bool isSameName(ByteView a, ByteView b) {
    if (ber::isEqual(a, b)) return true;
    if (a.size() > kMaximumNameSize || b.size() > kMaximumNameSize) return false;
    const Name first = parseName(a);
    const Name second = parseName(b);
    return first && second && X509_NAME_cmp(first.get(), second.get()) == 0;
}

/// A number without the leading bytes that only repeat its sign.
ByteView shortestNumber(ByteView number) {
    const auto isNegative = [](std::byte digit) { return (digit & std::byte{0x80}) != std::byte{}; };
    while (number.size() > 1 && number[0] == (isNegative(number[1]) ? std::byte{0xFF} : std::byte{0}))
        number = number.subspan(1);
    return number;
}

bool isOf(const MessageCertificate& certificate, const MessageSigner& signer) {
    if (signer.keyIdentifier) return certificate.keyIdentifier == signer.keyIdentifier;
    return ber::isEqual(shortestNumber(certificate.serialNumber), shortestNumber(signer.serialNumber)) &&
           isSameName(certificate.issuer, signer.issuer);
}

const MessageCertificate& certificateOfSigner(const SignedMessage& message) {
    const auto found = std::ranges::find_if(
        message.certificates, [&](const MessageCertificate& one) { return isOf(one, message.signer); });
    if (found == message.certificates.end()) refuse("the signer's certificate is not in the message");
    return *found;
}

// The bytes that the signature covers instead of the content.
Data signedBytes(const SignedMessage& message, ByteView content) {
    const MessageSigner& signer = message.signer;
    const ber::Element& attributes = *signer.signedAttributes;
    const auto type = soleValueOf(attributes, asBytes(kContentTypeAttribute), kSignedAttributes);
    if (!type || type->tag != ber::kObjectIdentifier || !ber::isEqual(type->contents, message.contentType))
        refuse("the signed attributes have not the content's type");
    const auto digest = soleValueOf(attributes, asBytes(kMessageDigestAttribute), kSignedAttributes);
    const auto computed = messageDigest(signer.digestAlgorithm, content);
    if (!computed) refuse("the signer's digest algorithm is unknown");
    ber::Work work;
    if (!digest || (digest->tag & ~ber::kConstructed) != ber::kOctetString ||
        ber::octets(*digest, work, kSignedAttributes) != *computed)
        refuse("the signed attributes have not the content's digest");
    Data bytes = ber::inDer(attributes, work, kSignedAttributes);
    bytes.front() = std::byte{ber::kSet};  // it is [0] in the message
    return bytes;
}

void requireSignedBySigner(const SignedMessage& message, ByteView content) {
    const MessageSigner& signer = message.signer;
    const auto isSigners = [&](const Algorithm& listed) {
        return ber::isEqual(listed.identifier, signer.digestAlgorithm.identifier);
    };
    if (std::ranges::none_of(message.digestAlgorithms, isSigners))
        refuse("the message does not list the signer's digest algorithm");
    if (!signer.signedAttributes && !ber::isEqual(message.contentType, asBytes(kPlainData)))
        refuse("the message has no signed attributes");
    const MessageCertificate& certificate = certificateOfSigner(message);
    const Data attributes = signer.signedAttributes ? signedBytes(message, content) : Data();
    requireSignature(certificate.publicKey, signer.digestAlgorithm, signer.signatureAlgorithm,
                     signer.signature, signer.signedAttributes ? ByteView(attributes) : content);
}

/// The content of a time-stamp token whose own signature verifies.
Data requireToken(ByteView bytes) {
    SignedMessage token = parseSignedMessage(bytes);
    if (!token.content || !ber::isEqual(token.contentType, asBytes(kTimeStampContent)))
        refuse("the time-stamp token holds no time stamp");
    requireSignedBySigner(token, *token.content);
    return *std::move(token.content);
}

}  // namespace

void requireDetachedCms(ByteView cms, ByteView content) {
    const ErrorQueueGuard guard;
    const SignedMessage message = parseSignedMessage(cms);
    if (message.content) refuse("the signer's message is not detached");
    requireSignedBySigner(message, content);
}

std::optional<Date> secureTimestamp(ByteView cms) {
    const ErrorQueueGuard guard;
    try {
        const SignedMessage message = parseSignedMessage(cms);
        if (!message.signer.unsignedAttributes) return std::nullopt;
        // With more than one token, none is used.
        const auto token = soleValueOf(*message.signer.unsignedAttributes, asBytes(kTimeStampTokenAttribute),
                                       kUnsignedAttributes);
        if (!token) return std::nullopt;
        const Data content = requireToken(token->whole);
        const TimeStamp stamp = parseTimeStamp(content);
        const auto imprint = messageDigest(stamp.imprintAlgorithm, message.signer.signature);
        if (!imprint || !ber::isEqual(*imprint, stamp.imprint)) return std::nullopt;
        return stamp.time;
    } catch (const CodeError&) {
        return std::nullopt;
    }
}

}  // namespace pinwell::codesign
