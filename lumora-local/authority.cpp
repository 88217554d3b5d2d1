#include "lumora-local/authority.h"

#include <openssl/asn1.h>
#include <openssl/bn.h>
#include <openssl/ec.h>

#include <ctime>

#include "lumora-local/endpoint.h"
#include "lumora-local/openssl_handles.h"

namespace pinwell::lumora {
namespace {

using foundation::Date;

constexpr std::int64_t kDay = 24 * 60 * 60;
constexpr std::int64_t kValidity = 3653 * kDay;

// RFC 5280, 4.1.2.2: at most 20 octets and positive, so 159 random bits.
constexpr int kSerialNumberBits = 159;

// RFC 5280, appendix A: ub-common-name.
constexpr std::size_t kMaximumCommonNameLength = 64;

// The markers count by their presence alone; their value is an ASN.1 NULL.
constexpr std::array<unsigned char, 2> kMarkerValue{0x05, 0x00};

using BigNumberHandle = std::unique_ptr<BIGNUM, OpenSSLDeleter<BN_free>>;
using ObjectHandle = std::unique_ptr<ASN1_OBJECT, OpenSSLDeleter<ASN1_OBJECT_free>>;
using OctetStringHandle = std::unique_ptr<ASN1_OCTET_STRING, OpenSSLDeleter<ASN1_OCTET_STRING_free>>;

struct Issued {
    CertificateHandle certificate;
    KeyHandle key;
};

/// What one certificate of the authority says. Extension values are in the library's configuration syntax.
struct Profile {
    std::string commonName;
    std::string basicConstraints;
    std::string keyUsage;
    std::string extendedKeyUsage{};
    std::string subjectAlternativeName{};
    std::string_view markerOid{};
};

void setSerialNumber(X509* certificate) {
    const BigNumberHandle number(BN_new());
    require(number != nullptr &&
                BN_rand(number.get(), kSerialNumberBits, BN_RAND_TOP_ANY, BN_RAND_BOTTOM_ANY) == 1 &&
                BN_add_word(number.get(), 1) == 1 &&
                BN_to_ASN1_INTEGER(number.get(), X509_get_serialNumber(certificate)) != nullptr,
            "choose a serial number");
}

void setSubject(X509* certificate, const std::string& commonName) {
    X509_NAME* subject = X509_get_subject_name(certificate);
    const auto add = [&](const char* field, std::string_view text) {
        const foundation::ByteView bytes = foundation::asBytes(text);
        require(X509_NAME_add_entry_by_txt(subject, field, MBSTRING_UTF8, octets(bytes),
                                           static_cast<int>(bytes.size()), -1, 0) == 1,
                "set a certificate's subject");
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

void addMarker(X509* certificate, std::string_view oid) {
    const ObjectHandle object(OBJ_txt2obj(std::string(oid).c_str(), 1));
    const OctetStringHandle value(ASN1_OCTET_STRING_new());
    require(object != nullptr && value != nullptr &&
                ASN1_OCTET_STRING_set(value.get(), kMarkerValue.data(), kMarkerValue.size()) == 1,
            "make a certificate marker");
    const ExtensionHandle extension(X509_EXTENSION_create_by_OBJ(nullptr, object.get(), 0, value.get()));
    require(extension != nullptr && X509_add_ext(certificate, extension.get(), -1) == 1,
            "add a certificate marker");
}

/// A certificate for a fresh key, signed by `issuer`, or by itself when there is none.
Issued issue(const Profile& profile, const Issued* issuer, Date now) {
    Issued made{CertificateHandle(X509_new()), KeyHandle(EVP_EC_gen("P-256"))};
    require(made.certificate != nullptr && made.key != nullptr, "make a key");
    X509* certificate = made.certificate.get();
    const Issued& parent = issuer != nullptr ? *issuer : made;

    require(X509_set_version(certificate, X509_VERSION_3) == 1 &&
                X509_set_pubkey(certificate, made.key.get()) == 1,
            "make a certificate");
    setSerialNumber(certificate);
    setSubject(certificate, profile.commonName);
    setValidity(certificate, now);
    require(X509_set_issuer_name(certificate, X509_get_subject_name(parent.certificate.get())) == 1,
            "set a certificate's issuer");

    const auto add = [&](int identifier, const std::string& value) {
        if (!value.empty()) addExtension(certificate, parent.certificate.get(), identifier, value);
    };
    add(NID_basic_constraints, profile.basicConstraints);
    add(NID_key_usage, profile.keyUsage);
    add(NID_ext_key_usage, profile.extendedKeyUsage);
    add(NID_subject_key_identifier, "hash");  // before the authority's, which for the root is taken from it
    add(NID_authority_key_identifier, "keyid:always");
    add(NID_subject_alt_name, profile.subjectAlternativeName);
    if (!profile.markerOid.empty()) addMarker(certificate, profile.markerOid);

    require(X509_sign(certificate, parent.key.get(), EVP_sha256()) > 0, "sign a certificate");
    return made;
}

std::string contentsOf(BIO* bio) {
    char* text = nullptr;
    const long length = BIO_get_mem_data(bio, &text);
    return {text, static_cast<std::size_t>(length)};
}

Identity toPem(const Issued& issued) {
    const BioHandle certificate(BIO_new(BIO_s_mem()));
    const BioHandle key(BIO_new(BIO_s_secmem()));
    require(certificate != nullptr && key != nullptr &&
                PEM_write_bio_X509(certificate.get(), issued.certificate.get()) == 1 &&
                PEM_write_bio_PKCS8PrivateKey(key.get(), issued.key.get(), nullptr, nullptr, 0, nullptr,
                                              nullptr) == 1,
            "encode a certificate");
    return {contentsOf(certificate.get()), contentsOf(key.get())};
}

/// Canonical hosts hold no character that the configuration syntax gives a meaning.
std::string subjectAlternativeName(const std::vector<std::string>& hosts) {
    std::string names;
    for (const std::string& host : hosts) {
        if (!names.empty()) names += ',';
        names += (isAddress(host) ? "IP:" : "DNS:") + host;
    }
    return names;
}

}  // namespace

Authority createAuthority(const std::vector<std::string>& hosts, Date now) {
    const Profile rootProfile{.commonName = "Lumora Local Root",
                              .basicConstraints = "critical,CA:TRUE",
                              .keyUsage = "critical,keyCertSign,cRLSign"};
    const Profile intermediateProfile{.commonName = "Lumora Local Ticket Authority",
                                      .basicConstraints = "critical,CA:TRUE,pathlen:0",
                                      .keyUsage = "critical,keyCertSign,cRLSign",
                                      .markerOid = kTicketIntermediateMarkerOid};
    const Profile signerProfile{.commonName = "Lumora Local Ticket Signer",
                                .basicConstraints = "critical,CA:FALSE",
                                .keyUsage = "critical,digitalSignature",
                                .markerOid = kTicketSignerMarkerOid};
    const Profile serverProfile{.commonName = hosts.front().substr(0, kMaximumCommonNameLength),
                                .basicConstraints = "critical,CA:FALSE",
                                .keyUsage = "critical,digitalSignature",
                                .extendedKeyUsage = "serverAuth",
                                .subjectAlternativeName = subjectAlternativeName(hosts),
                                .markerOid = kServerMarkerOid};

    const Issued root = issue(rootProfile, nullptr, now);
    const Issued intermediate = issue(intermediateProfile, &root, now);
    const Issued signer = issue(signerProfile, &intermediate, now);
    const Issued server = issue(serverProfile, &root, now);
    return {toPem(root), toPem(intermediate), toPem(signer), toPem(server)};
}

}  // namespace pinwell::lumora
