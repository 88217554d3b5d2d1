#include "codesign/cms_signature.h"

#include <openssl/evp.h>
#include <openssl/rsa.h>
#include <openssl/x509.h>

#include <algorithm>
#include <array>
#include <bit>
#include <string_view>

#include "base/handle.h"
#include "codesign/cms_message.h"
#include "codesign/code_error.h"
#include "crypto/openssl.h"

namespace pinwell::codesign {

using base::asBytes;
using base::ByteView;
using base::Data;
using ber::Reader;
using ber::Work;
using crypto::ErrorQueueGuard;
using crypto::NameHandle;
using crypto::unsignedBytes;
using values::Date;

namespace {

constexpr const char* kPublicKey = "the signer's key";
constexpr const char* kPssParameters = "the signature's algorithm";

constexpr std::string_view kRsa = "\x2A\x86\x48\x86\xF7\x0D\x01\x01\x01";            // 1.2.840.113549.1.1.1
constexpr std::string_view kRsaPss = "\x2A\x86\x48\x86\xF7\x0D\x01\x01\x0A";         // 1.2.840.113549.1.1.10
constexpr std::string_view kMaskFunction1 = "\x2A\x86\x48\x86\xF7\x0D\x01\x01\x08";  // 1.2.840.113549.1.1.8
constexpr std::string_view kEllipticCurve = "\x2A\x86\x48\xCE\x3D\x02\x01";          // 1.2.840.10045.2.1

/// The arcs that signature algorithms are below, of any digest.
constexpr std::string_view kRsaArc = "\x2A\x86\x48\x86\xF7\x0D\x01\x01";   // 1.2.840.113549.1.1
constexpr std::string_view kEcdsaArc = "\x2A\x86\x48\xCE\x3D";             // 1.2.840.10045
constexpr std::string_view kNistArc = "\x60\x86\x48\x01\x65\x03\x04\x03";  // 2.16.840.1.101.3.4.3
constexpr int kFirstNistEcdsa = 9;
constexpr int kFirstNistRsa = 13;
constexpr int kLastNistRsa = 16;

struct KnownDigest {
    std::string_view identifier;
    const EVP_MD* (*algorithm)();
};

constexpr std::array kDigests = {
    KnownDigest{"\x2A\x86\x48\x86\xF7\x0D\x02\x05", EVP_md5},
    KnownDigest{"\x2B\x0E\x03\x02\x1A", EVP_sha1},
    KnownDigest{"\x60\x86\x48\x01\x65\x03\x04\x02\x01", EVP_sha256},
    KnownDigest{"\x60\x86\x48\x01\x65\x03\x04\x02\x02", EVP_sha384},
    KnownDigest{"\x60\x86\x48\x01\x65\x03\x04\x02\x03", EVP_sha512},
    KnownDigest{"\x60\x86\x48\x01\x65\x03\x04\x02\x04", EVP_sha224},
    KnownDigest{"\x60\x86\x48\x01\x65\x03\x04\x02\x05", EVP_sha512_224},
    KnownDigest{"\x60\x86\x48\x01\x65\x03\x04\x02\x06", EVP_sha512_256},
    KnownDigest{"\x60\x86\x48\x01\x65\x03\x04\x02\x07", EVP_sha3_224},
    KnownDigest{"\x60\x86\x48\x01\x65\x03\x04\x02\x08", EVP_sha3_256},
    KnownDigest{"\x60\x86\x48\x01\x65\x03\x04\x02\x09", EVP_sha3_384},
    KnownDigest{"\x60\x86\x48\x01\x65\x03\x04\x02\x0A", EVP_sha3_512},
};

bool is(ByteView identifier, std::string_view known) {
    return ber::isEqual(identifier, asBytes(known));
}

/// The last number of an identifier that is directly below `arc`; 0 if it is not.
int numberBelow(std::string_view arc, ByteView identifier) {
    if (identifier.size() != arc.size() + 1 || !is(identifier.first(arc.size()), arc)) return 0;
    return std::to_integer<int>(identifier.back());
}

bool isBelow(std::string_view arc, ByteView identifier) {
    return identifier.size() > arc.size() && is(identifier.first(arc.size()), arc);
}

/// Returns null for an unknown one.
const EVP_MD* digestNamed(ByteView identifier) {
    const auto* const found = std::ranges::find_if(
        kDigests, [&](const KnownDigest& digest) { return is(identifier, digest.identifier); });
    return found == kDigests.end() ? nullptr : found->algorithm();
}

std::size_t bitsOf(ByteView number) {
    const auto first = std::ranges::find_if(number, [](std::byte b) { return b != std::byte{0}; });
    const auto length = static_cast<std::size_t>(number.end() - first);
    if (length == 0) return 0;
    // The width's type differs between the versions of the standard library.
    return 8 * (length - 1) + static_cast<std::size_t>(std::bit_width(std::to_integer<unsigned>(*first)));
}

// The bits of the modulus in { modulus, exponent }, the contents of the key's BIT STRING after its first
// byte.
void requireRsaWithinBounds(ByteView key, Work& work) {
    Reader outer(key, work);
    Reader numbers(outer.expect(ber::kSequence, kPublicKey).contents, work);
    outer.finish(kPublicKey);
    if (bitsOf(numbers.expect(ber::kInteger, kPublicKey).contents) > kMaximumRsaBits)
        refuse("the signer's RSA key is too long");
    numbers.expect(ber::kInteger, kPublicKey);
    numbers.finish(kPublicKey);
}

enum class KeySort { rsa, rsaPss, ellipticCurve };

KeySort requireKeyWithinBounds(ByteView publicKey) {
    if (publicKey.size() > kMaximumPublicKeySize) refuse("the signer's key is too long");
    Work work;
    Reader whole(publicKey, work);
    Reader fields(whole.expect(ber::kSequence, kPublicKey).contents, work);
    const ByteView algorithm = readAlgorithm(fields, work, kPublicKey).identifier;
    const ByteView bits = fields.expect(ber::kBitString, kPublicKey).contents;
    fields.finish(kPublicKey);
    if (is(algorithm, kEllipticCurve)) return KeySort::ellipticCurve;
    if (!is(algorithm, kRsa) && !is(algorithm, kRsaPss)) refuse("the signer's key is neither RSA nor EC");
    if (bits.empty()) refuse("the signer's key is malformed");
    requireRsaWithinBounds(bits.subspan(1), work);
    return is(algorithm, kRsa) ? KeySort::rsa : KeySort::rsaPss;
}

void requireAlgorithmOf(KeySort sort, ByteView algorithm) {
    const int nist = numberBelow(kNistArc, algorithm);
    const bool isEcdsa = isBelow(kEcdsaArc, algorithm) || (nist >= kFirstNistEcdsa && nist < kFirstNistRsa);
    const bool isRsa = isBelow(kRsaArc, algorithm) || (nist >= kFirstNistRsa && nist <= kLastNistRsa);
    const bool fits = sort == KeySort::ellipticCurve ? isEcdsa
                      : sort == KeySort::rsaPss      ? is(algorithm, kRsaPss)
                                                     : isRsa;
    if (!fits) refuse("the signature's algorithm is not one of the signer's key");
}

/// RSASSA-PSS-params (RFC 4055): { [0] digest, [1] mask function, [2] salt length, [3] trailer }.
struct PssParameters {
    const EVP_MD* digest = EVP_sha1();
    const EVP_MD* maskDigest = EVP_sha1();
    int saltLength = 20;
};

int readSmallNumber(Reader reader) {
    const ByteView number = reader.expect(ber::kInteger, kPssParameters).contents;
    reader.finish(kPssParameters);
    if (number.empty() || number.size() > 2 || (number.front() & std::byte{0x80}) != std::byte{})
        refuse("the signature's algorithm has a number that is out of range");
    int value = 0;
    for (const std::byte digit : number) value = value << 8 | std::to_integer<int>(digit);
    return value;
}

PssParameters readPssParameters(ByteView parameters) {
    PssParameters found;
    if (parameters.empty()) return found;
    Work work;
    Reader whole(parameters, work);
    Reader fields(whole.expect(ber::kSequence, kPssParameters).contents, work);
    if (const auto digest = fields.nextIf(ber::context(0), kPssParameters)) {
        Reader inner(digest->contents, work);
        found.digest = digestNamed(readAlgorithm(inner, work, kPssParameters).identifier);
    }
    if (const auto mask = fields.nextIf(ber::context(1), kPssParameters)) {
        Reader inner(mask->contents, work);
        const Algorithm function = readAlgorithm(inner, work, kPssParameters);
        if (!is(function.identifier, kMaskFunction1)) refuse("the signature's mask function is unknown");
        Reader digest(function.parameters, work);
        found.maskDigest = digestNamed(readAlgorithm(digest, work, kPssParameters).identifier);
    }
    if (const auto salt = fields.nextIf(ber::context(2), kPssParameters))
        found.saltLength = readSmallNumber(Reader(salt->contents, work));
    if (const auto trailer = fields.nextIf(ber::context(3), kPssParameters);
        trailer && readSmallNumber(Reader(trailer->contents, work)) != 1)
        refuse("the signature's trailer is unknown");
    fields.finish(kPssParameters);
    return found;
}

void setPss(EVP_PKEY_CTX* context, const EVP_MD* digest, ByteView parameters) {
    const PssParameters pss = readPssParameters(parameters);
    if (pss.digest != digest || pss.maskDigest == nullptr)
        refuse("the signature's digests are unknown or two");
    if (EVP_PKEY_CTX_set_rsa_padding(context, RSA_PKCS1_PSS_PADDING) != 1 ||
        EVP_PKEY_CTX_set_rsa_mgf1_md(context, pss.maskDigest) != 1 ||
        EVP_PKEY_CTX_set_rsa_pss_saltlen(context, pss.saltLength) != 1)
        refuse("the signature's algorithm does not fit the signer's key");
}

/// The digest of `bytes` by the algorithm's identifier: MD5, SHA-1, or one of the families SHA-2 and SHA-3;
/// nullopt for others.
std::optional<Data> messageDigest(const Algorithm& algorithm, ByteView bytes) {
    const EVP_MD* const digest = digestNamed(algorithm.identifier);
    if (digest == nullptr) return std::nullopt;
    std::array<unsigned char, EVP_MAX_MD_SIZE> value = {};
    unsigned length = 0;
    if (EVP_Digest(bytes.data(), bytes.size(), value.data(), &length, digest, nullptr) != 1)
        return std::nullopt;
    return base::toData(std::as_bytes(std::span(value)).first(length));
}

/// Verifies `signature` over `bytes` with a SubjectPublicKeyInfo. The digest is the signer's
/// `digestAlgorithm`; the signature algorithm's digest is ignored, except that RSASSA-PSS must name the same.
/// Throws CodeError if the key is neither RSA (within kMaximumRsaBits) nor EC, if the signature algorithm
/// does not fit the key, or if the signature does not verify.
void requireSignature(ByteView publicKey, const Algorithm& digestAlgorithm,
                      const Algorithm& signatureAlgorithm, ByteView signature, ByteView bytes) {
    const KeySort sort = requireKeyWithinBounds(publicKey);
    requireAlgorithmOf(sort, signatureAlgorithm.identifier);
    const EVP_MD* const digest = digestNamed(digestAlgorithm.identifier);
    if (digest == nullptr) refuse("the signer's digest algorithm is unknown");

    const unsigned char* cursor = unsignedBytes(publicKey);
    const crypto::KeyHandle key(d2i_PUBKEY(nullptr, &cursor, static_cast<long>(publicKey.size())));
    if (!key) refuse("the signer's key is malformed");
    if (signature.size() > static_cast<std::size_t>(std::max(EVP_PKEY_get_size(key.get()), 0)))
        refuse("the signer's signature does not verify");

    const crypto::DigestContextHandle context(EVP_MD_CTX_new());
    EVP_PKEY_CTX* keyContext = nullptr;
    if (!context || EVP_DigestVerifyInit(context.get(), &keyContext, digest, nullptr, key.get()) != 1)
        refuse("the signer's key cannot verify a signature");
    if (is(signatureAlgorithm.identifier, kRsaPss)) setPss(keyContext, digest, signatureAlgorithm.parameters);
    if (EVP_DigestVerify(context.get(), unsignedBytes(signature), signature.size(), unsignedBytes(bytes),
                         bytes.size()) != 1)
        refuse("the signer's signature does not verify");
}

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

NameHandle parseName(ByteView bytes) {
    const unsigned char* cursor = unsignedBytes(bytes);
    return NameHandle(d2i_X509_NAME(nullptr, &cursor, static_cast<long>(bytes.size())));
}

// A name may have other string types in the message than in the certificate.
bool isSameName(ByteView a, ByteView b) {
    if (ber::isEqual(a, b)) return true;
    if (a.size() > kMaximumNameSize || b.size() > kMaximumNameSize) return false;
    const NameHandle first = parseName(a);
    const NameHandle second = parseName(b);
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
