#include "trust/certificate.h"

#include <openssl/core_names.h>

#include <algorithm>
#include <array>

#include "foundation/description.h"
#include "trust/der.h"
#include "trust/openssl.h"

namespace pinwell::trust {
namespace {

using TimeHandle = Handle<ASN1_TIME, ASN1_TIME_free>;

constexpr std::array kSoundDigests{NID_sha224,     NID_sha256,   NID_sha384,   NID_sha512,   NID_sha512_224,
                                   NID_sha512_256, NID_sha3_224, NID_sha3_256, NID_sha3_384, NID_sha3_512};

std::optional<Date> toDate(const ASN1_TIME* time) {
    if (time == nullptr || ASN1_TIME_check(time) != 1) return std::nullopt;
    const TimeHandle epoch(ASN1_TIME_set(nullptr, 0));
    int days = 0;
    int seconds = 0;
    if (!epoch || ASN1_TIME_diff(&days, &seconds, epoch.get(), time) != 1) return std::nullopt;
    return Date{std::int64_t{days} * 86400 + seconds};
}

std::string nameEntryText(const X509_NAME_ENTRY* entry) {
    unsigned char* text = nullptr;
    const int length = ASN1_STRING_to_UTF8(&text, X509_NAME_ENTRY_get_data(entry));
    if (length < 0) return {};
    std::string result = foundation::toString(byteView(text, length));
    OPENSSL_free(text);
    return result;
}

std::string keyIdentifier(const X509* certificate, const CertificateExtensions& extensions) {
    if (extensions.subjectKeyIdentifier) return foundation::toHex(*extensions.subjectKeyIdentifier);
    std::array<unsigned char, EVP_MAX_MD_SIZE> digest{};
    unsigned length = 0;
    if (X509_pubkey_digest(certificate, EVP_sha1(), digest.data(), &length) != 1) return {};
    return foundation::toHex(byteView(digest.data(), static_cast<int>(length)));
}

/// Escaped here, since every use of it is a text for people and its author is whoever made the certificate.
std::string summarize(const X509* certificate, const CertificateExtensions& extensions) {
    X509_NAME* const subject = X509_get_subject_name(certificate);
    int index = -1;
    int last = -1;
    while ((index = X509_NAME_get_index_by_NID(subject, NID_commonName, index)) >= 0) last = index;
    if (last < 0) last = X509_NAME_entry_count(subject) - 1;
    std::string text = last >= 0 ? nameEntryText(X509_NAME_get_entry(subject, last)) : std::string();
    if (text.empty()) text = keyIdentifier(certificate, extensions);
    return foundation::escapeForTerminal(text);
}

bool restsOnWeakDigest(X509* certificate) {
    int digest = NID_undef;
    int key = NID_undef;
    if (X509_get_signature_info(certificate, &digest, &key, nullptr, nullptr) != 1) return true;
    if (key == NID_ED25519 || key == NID_ED448) return false;  // the digest is part of the scheme
    return std::find(kSoundDigests.begin(), kSoundDigests.end(), digest) == kSoundDigests.end();
}

/// A certificate that describes its own curve could choose a generator that makes a known public key fit a
/// private key of its own, so a curve must be named (RFC 5480, 2.1.1).
bool describesOwnCurve(const EVP_PKEY* key) {
    int explicitParameters = 0;
    if (EVP_PKEY_get_int_param(key, OSSL_PKEY_PARAM_EC_DECODED_FROM_EXPLICIT_PARAMS, &explicitParameters) ==
        1) {
        return explicitParameters != 0;
    }
    return true;
}

std::shared_ptr<const X509PublicKey> readPublicKey(const X509* certificate) {
    EVP_PKEY* const key = X509_get0_pubkey(certificate);
    if (key == nullptr) return nullptr;
    if (EVP_PKEY_is_a(key, "EC") == 1 && describesOwnCurve(key)) return nullptr;
    EVP_PKEY_up_ref(key);
    return std::make_shared<const X509PublicKey>(std::shared_ptr<EVP_PKEY>(key, EVP_PKEY_free));
}

/// The part of a well-formed certificate that its signature covers.
ByteView signedPart(ByteView certificate) {
    const std::optional<der::Element> whole = der::readElement(certificate);
    const std::optional<der::Element> part = whole ? der::readElement(whole->contents) : std::nullopt;
    return part ? part->whole : ByteView();
}

/// There are three versions, and extensions in the last of them alone (RFC 5280, 4.1.2.1 and 4.1.2.9).
bool isWhatItsVersionSays(const X509* certificate) {
    const long version = X509_get_version(certificate);
    return version == X509_VERSION_3 ||
           ((version == X509_VERSION_1 || version == X509_VERSION_2) && X509_get_ext_count(certificate) == 0);
}

}  // namespace

std::string_view X509PublicKey::type() const {
    if (EVP_PKEY_is_a(native(), "RSA") == 1 || EVP_PKEY_is_a(native(), "RSA-PSS") == 1) return kKeyTypeRSA;
    if (EVP_PKEY_is_a(native(), "EC") == 1) return kKeyTypeEllipticCurve;
    return {};
}

int X509PublicKey::bits() const {
    return EVP_PKEY_get_bits(native());
}

X509CertificateRef X509Certificate::parse(ByteView der) {
    if (der.size() > kMaximumCertificateSize) return nullptr;
    const std::optional<der::Element> element = der::readElement(der);
    if (!element || element->tag != der::kConstructedSequence || element->whole.size() != der.size() ||
        !der::isNestedDefinite(der)) {
        return nullptr;
    }
    const ErrorQueueGuard guard;
    const unsigned char* at = unsignedBytes(der);
    std::shared_ptr<X509> parsed(d2i_X509(nullptr, &at, static_cast<long>(der.size())), X509_free);
    if (!parsed || at != unsignedBytes(der) + der.size() || !isWhatItsVersionSays(parsed.get()))
        return nullptr;

    const std::optional<Date> notBefore = toDate(X509_get0_notBefore(parsed.get()));
    const std::optional<Date> notAfter = toDate(X509_get0_notAfter(parsed.get()));
    if (!notBefore || !notAfter) return nullptr;

    const std::shared_ptr<X509Certificate> result(new X509Certificate(parsed, foundation::toData(der)));
    result->extensions_ = readExtensions(parsed.get());
    result->summary_ = summarize(parsed.get(), result->extensions_);
    result->notBefore_ = *notBefore;
    result->notAfter_ = *notAfter;
    result->emptySubject_ = X509_NAME_entry_count(X509_get_subject_name(parsed.get())) == 0;
    result->selfIssued_ =
        X509_NAME_cmp(X509_get_subject_name(parsed.get()), X509_get_issuer_name(parsed.get())) == 0;
    result->weakDigest_ = restsOnWeakDigest(parsed.get());
    result->publicKey_ = readPublicKey(parsed.get());
    return result;
}

bool X509Certificate::isNamedAsIssuerOf(const X509Certificate& other) const {
    return X509_NAME_cmp(X509_get_subject_name(certificate_.get()),
                         X509_get_issuer_name(other.certificate_.get())) == 0;
}

bool X509Certificate::verifiesSignatureOf(const X509Certificate& other) const {
    const ErrorQueueGuard guard;
    return publicKey_ != nullptr && X509_verify(other.certificate_.get(), publicKey_->native()) == 1;
}

bool X509Certificate::saysTheSameAs(const X509Certificate& other) const {
    return std::ranges::equal(signedPart(der_), signedPart(other.der_));
}

bool X509Certificate::hasSameSubjectAndKeyAs(const X509Certificate& other) const {
    const ErrorQueueGuard guard;
    return publicKey_ != nullptr && other.publicKey_ != nullptr &&
           X509_NAME_cmp(X509_get_subject_name(certificate_.get()),
                         X509_get_subject_name(other.certificate_.get())) == 0 &&
           EVP_PKEY_eq(publicKey_->native(), other.publicKey_->native()) == 1;
}

}  // namespace pinwell::trust
