#include <openssl/asn1.h>
#include <openssl/bn.h>
#include <openssl/ec.h>
#include <openssl/rsa.h>

#include <ctime>

#include "base/bytes.h"
#include "certificates.h"

namespace pinwell::lumora {
namespace {

using crypto::ExtensionHandle;
using crypto::NumberHandle;
using crypto::OctetStringHandle;
using values::Date;

constexpr std::int64_t kDay = 24 * 60 * 60;
constexpr std::int64_t kValidity = 3653 * kDay;

// RFC 5280, 4.1.2.2: at most 20 octets and positive, so 159 random bits.
constexpr int kSerialNumberBits = 159;

// The presence of the markers counts; their value is an ASN.1 NULL.
constexpr std::array<unsigned char, 2> kMarkerValue{0x05, 0x00};

void releaseExtensions(STACK_OF(X509_EXTENSION) * list) {
    sk_X509_EXTENSION_pop_free(list, X509_EXTENSION_free);
}

using RequestHandle = base::Handle<X509_REQ, X509_REQ_free>;
using ExtensionListHandle = base::Handle<STACK_OF(X509_EXTENSION), releaseExtensions>;

void setSerialNumber(X509* certificate) {
    const NumberHandle number(BN_new());
    require(number != nullptr &&
                BN_rand(number.get(), kSerialNumberBits, BN_RAND_TOP_ANY, BN_RAND_BOTTOM_ANY) == 1 &&
                BN_add_word(number.get(), 1) == 1 &&
                BN_to_ASN1_INTEGER(number.get(), X509_get_serialNumber(certificate)) != nullptr,
            "choose a serial number");
}

void addNames(X509_NAME* subject, const std::string& commonName) {
    const auto add = [&](const char* field, std::string_view text) {
        const base::ByteView bytes = base::asBytes(text);
        require(X509_NAME_add_entry_by_txt(subject, field, MBSTRING_UTF8, unsignedBytes(bytes),
                                           static_cast<int>(bytes.size()), -1, 0) == 1,
                "set a subject");
    };
    add("O", "Lumora Local");
    add("CN", commonName);
}

void setValidity(X509* certificate, Date now) {
    const auto at = [](std::int64_t seconds) { return static_cast<std::time_t>(seconds); };
    require(ASN1_TIME_set(X509_getm_notBefore(certificate), at(now.seconds - kDay)) != nullptr &&
                ASN1_TIME_set(X509_getm_notAfter(certificate), at(now.seconds + kValidity)) != nullptr,
            "set a certificate's validity");
}

void addExtension(X509* certificate, X509* issuer, int identifier, const std::string& value) {
    X509V3_CTX context;
    X509V3_set_ctx_nodb(&context);
    X509V3_set_ctx(&context, issuer, certificate, nullptr, nullptr, 0);
    const ExtensionHandle extension(X509V3_EXT_conf_nid(nullptr, &context, identifier, value.c_str()));
    require(extension != nullptr && X509_add_ext(certificate, extension.get(), -1) == 1,
            "add a certificate extension");
}

ExtensionHandle markerExtension(std::string_view oid) {
    const ObjectHandle object(OBJ_txt2obj(std::string(oid).c_str(), 1));
    const OctetStringHandle value(ASN1_OCTET_STRING_new());
    require(object != nullptr && value != nullptr &&
                ASN1_OCTET_STRING_set(value.get(), kMarkerValue.data(), kMarkerValue.size()) == 1,
            "make a certificate marker");
    ExtensionHandle extension(X509_EXTENSION_create_by_OBJ(nullptr, object.get(), 0, value.get()));
    require(extension != nullptr, "make a certificate marker");
    return extension;
}

void addMarker(X509* certificate, std::string_view oid) {
    require(X509_add_ext(certificate, markerExtension(oid).get(), -1) == 1, "add a certificate marker");
}

CertificateHandle makeCertificate(const CertificateProfile& profile, EVP_PKEY* subject, X509* issuerOrSelf,
                                  EVP_PKEY* issuerKey, Date now) {
    CertificateHandle made(X509_new());
    require(made != nullptr, "make a certificate");
    X509* certificate = made.get();
    X509* issuer = issuerOrSelf != nullptr ? issuerOrSelf : certificate;

    require(X509_set_version(certificate, X509_VERSION_3) == 1 && X509_set_pubkey(certificate, subject) == 1,
            "make a certificate");
    setSerialNumber(certificate);
    addNames(X509_get_subject_name(certificate), profile.commonName);
    setValidity(certificate, now);
    require(X509_set_issuer_name(certificate, X509_get_subject_name(issuer)) == 1,
            "set a certificate's issuer");

    const auto add = [&](int identifier, const std::string& value) {
        if (!value.empty()) addExtension(certificate, issuer, identifier, value);
    };
    add(NID_basic_constraints, profile.basicConstraints);
    add(NID_key_usage, profile.keyUsage);
    add(NID_ext_key_usage, profile.extendedKeyUsage);
    add(NID_subject_key_identifier, "hash");  // before the authority's, which for the root is taken from it
    add(NID_authority_key_identifier, "keyid:always");
    add(NID_subject_alt_name, profile.subjectAlternativeName);
    if (!profile.markerOid.empty()) addMarker(certificate, profile.markerOid);

    require(X509_sign(certificate, issuerKey, EVP_sha256()) > 0, "sign a certificate");
    return made;
}

}  // namespace

KeyHandle makeKey(KeyKind kind) {
    KeyHandle key(kind == KeyKind::rsa2048 ? EVP_RSA_gen(2048) : EVP_EC_gen("P-256"));
    require(key != nullptr, "make a key");
    return key;
}

CertificateHandle certifyKey(const CertificateProfile& profile, EVP_PKEY* subject,
                             const IssuedCertificate& issuer, Date now) {
    return makeCertificate(profile, subject, issuer.certificate.get(), issuer.key.get(), now);
}

IssuedCertificate issueCertificate(const CertificateProfile& profile, const IssuedCertificate* issuer,
                                   Date now) {
    IssuedCertificate made{nullptr, makeKey(profile.keyKind)};
    made.certificate =
        makeCertificate(profile, made.key.get(), issuer != nullptr ? issuer->certificate.get() : nullptr,
                        issuer != nullptr ? issuer->key.get() : made.key.get(), now);
    return made;
}

std::string requestCertificate(const CertificateProfile& profile, EVP_PKEY* key) {
    const RequestHandle request(X509_REQ_new());
    require(request != nullptr && X509_REQ_set_version(request.get(), X509_REQ_VERSION_1) == 1 &&
                X509_REQ_set_pubkey(request.get(), key) == 1,
            "make a certificate request");
    addNames(X509_REQ_get_subject_name(request.get()), profile.commonName);
    ExtensionListHandle extensions(sk_X509_EXTENSION_new_null());
    require(extensions != nullptr, "make a certificate request");
    const auto add = [&](ExtensionHandle extension) {
        require(extension != nullptr && sk_X509_EXTENSION_push(extensions.get(), extension.get()) > 0,
                "add an extension to a certificate request");
        static_cast<void>(extension.release());  // the list owns it
    };
    X509V3_CTX context;
    X509V3_set_ctx_nodb(&context);
    X509V3_set_ctx(&context, nullptr, nullptr, request.get(), nullptr, 0);
    const auto addText = [&](int identifier, const std::string& value) {
        if (!value.empty()) {
            add(ExtensionHandle(X509V3_EXT_conf_nid(nullptr, &context, identifier, value.c_str())));
        }
    };
    addText(NID_basic_constraints, profile.basicConstraints);
    addText(NID_key_usage, profile.keyUsage);
    if (!profile.markerOid.empty()) add(markerExtension(profile.markerOid));
    require(X509_REQ_add_extensions(request.get(), extensions.get()) == 1 &&
                X509_REQ_sign(request.get(), key, EVP_sha256()) > 0,
            "sign a certificate request");
    const BioHandle pem(BIO_new(BIO_s_mem()));
    require(pem != nullptr && PEM_write_bio_X509_REQ(pem.get(), request.get()) == 1,
            "encode a certificate request");
    return textOf(pem.get());
}

}  // namespace pinwell::lumora
