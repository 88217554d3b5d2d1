#include "trust/certificate_description.h"

#include <algorithm>
#include <array>

#include "trust/certificate.h"
#include "trust/openssl.h"

namespace pinwell::trust {
namespace {

using BignumHandle = Handle<BIGNUM, BN_free>;
using BioHandle = Handle<BIO, BIO_free_all>;
using X509Handle = Handle<X509, X509_free>;

std::string nameText(const X509_NAME* name) {
    const BioHandle text(BIO_new(BIO_s_mem()));
    // UTF-8 stays readable; what could drive a terminal does not get through.
    const unsigned long flags = (XN_FLAG_RFC2253 & ~ASN1_STRFLGS_ESC_MSB) | ASN1_STRFLGS_ESC_CTRL;
    if (!text || X509_NAME_print_ex(text.get(), name, 0, flags) < 0) return {};
    char* bytes = nullptr;
    const long length = BIO_get_mem_data(text.get(), &bytes);
    return length > 0 ? std::string(bytes, static_cast<std::size_t>(length)) : std::string();
}

std::string serialText(const X509* certificate) {
    const BignumHandle number(ASN1_INTEGER_to_BN(X509_get0_serialNumber(certificate), nullptr));
    if (!number) return {};
    std::string text(BN_is_negative(number.get()) == 1 ? "-" : "");
    foundation::Data bytes(static_cast<std::size_t>(BN_num_bytes(number.get())));
    if (bytes.empty()) return "00";
    BN_bn2bin(number.get(), static_cast<unsigned char*>(static_cast<void*>(bytes.data())));
    return text + foundation::toHex(bytes);
}

foundation::Data fingerprint(const X509* certificate, const EVP_MD* digest) {
    std::array<unsigned char, EVP_MAX_MD_SIZE> bytes{};
    unsigned length = 0;
    if (X509_digest(certificate, digest, bytes.data(), &length) != 1) return {};
    return foundation::toData(byteView(bytes.data(), static_cast<int>(length)));
}

std::string algorithmText(const X509* certificate) {
    const X509_ALGOR* algorithm = nullptr;
    X509_get0_signature(nullptr, &algorithm, certificate);
    const ASN1_OBJECT* oid = nullptr;
    X509_ALGOR_get0(&oid, nullptr, nullptr, algorithm);
    std::array<char, 128> text{};
    const int length = OBJ_obj2txt(text.data(), static_cast<int>(text.size()), oid, 0);
    return length > 0 ? std::string(text.data()) : std::string();
}

void describeKey(const X509Certificate& certificate, CertificateDescription& into) {
    const auto& key = certificate.publicKey();
    if (key == nullptr) return;
    into.keyType = key->type();
    if (into.keyType.empty()) {
        const char* const name = EVP_PKEY_get0_type_name(key->native());
        into.keyType = name == nullptr ? "unknown" : name;
    }
    into.keyBits = key->bits();
    if (key->type() != kKeyTypeEllipticCurve) return;
    std::array<char, 64> curve{};
    std::size_t length = 0;
    if (EVP_PKEY_get_group_name(key->native(), curve.data(), curve.size(), &length) == 1) {
        into.curve.assign(curve.data(), std::min(length, curve.size() - 1));
    }
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

std::optional<CertificateDescription> describeCertificate(foundation::ByteView der) {
    const X509CertificateRef certificate = X509Certificate::parse(der);
    if (certificate == nullptr) return std::nullopt;
    const ErrorQueueGuard guard;
    const unsigned char* at = unsignedBytes(der);
    const X509Handle parsed(d2i_X509(nullptr, &at, static_cast<long>(der.size())));
    if (!parsed) return std::nullopt;

    CertificateDescription description;
    description.subject = nameText(X509_get_subject_name(parsed.get()));
    description.issuer = nameText(X509_get_issuer_name(parsed.get()));
    description.summary = certificate->subjectSummary();
    description.serialNumber = serialText(parsed.get());
    description.notBefore = certificate->notBefore();
    description.notAfter = certificate->notAfter();
    describeKey(*certificate, description);
    description.signatureAlgorithm = algorithmText(parsed.get());
    description.isSelfIssued = certificate->isSelfIssued();
    describeExtensions(certificate->extensions(), description);
    description.sha1Fingerprint = fingerprint(parsed.get(), EVP_sha1());
    description.sha256Fingerprint = fingerprint(parsed.get(), EVP_sha256());
    return description;
}

}  // namespace pinwell::trust
