#include "support/certificate_builder.h"

#include <arpa/inet.h>
#include <openssl/bio.h>
#include <openssl/bn.h>
#include <openssl/core_names.h>
#include <openssl/ec.h>
#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/rsa.h>
#include <openssl/sha.h>
#include <openssl/x509.h>
#include <openssl/x509v3.h>

#include <map>
#include <mutex>

#include "base/byte_io.h"
#include "crypto/openssl.h"
#include "support/require.h"
#include "support/ticket_builder.h"
#include "trust/der.h"

namespace pinwell::test {
namespace {

using base::ByteView;
using base::ByteWriter;
using base::Data;

using crypto::BioHandle;
using crypto::CertificateHandle;
using crypto::DigestContextHandle;
using crypto::EcdsaSignatureHandle;
using crypto::ExtensionHandle;
using crypto::NameHandle;
using crypto::NumberHandle;
using crypto::ObjectHandle;
using crypto::textOf;
using crypto::unsignedBytes;

const unsigned char* unsignedText(const std::string& text) {
    return static_cast<const unsigned char*>(static_cast<const void*>(text.data()));
}

EVP_PKEY* generateOnDescribedCurve(const char* curve) {
    const crypto::KeyContextHandle context(EVP_PKEY_CTX_new_from_name(nullptr, "EC", nullptr));
    require(context && EVP_PKEY_keygen_init(context.get()) == 1 &&
                EVP_PKEY_CTX_set_group_name(context.get(), curve) == 1 &&
                EVP_PKEY_CTX_set_ec_param_enc(context.get(), OPENSSL_EC_EXPLICIT_CURVE) == 1,
            "described curve");
    EVP_PKEY* pair = nullptr;
    require(EVP_PKEY_generate(context.get(), &pair) == 1, "key generation failed");
    return pair;
}

EVP_PKEY* generatePair(KeyKind kind) {
    switch (kind) {
        case KeyKind::p224:
            return EVP_EC_gen("P-224");
        case KeyKind::p256:
            return EVP_EC_gen("P-256");
        case KeyKind::p256Described:
            return generateOnDescribedCurve("P-256");
        case KeyKind::p384:
            return EVP_EC_gen("P-384");
        case KeyKind::p521:
            return EVP_EC_gen("P-521");
        case KeyKind::rsa1024:
            return EVP_RSA_gen(1024U);
        case KeyKind::rsa2048:
            return EVP_RSA_gen(2048U);
        case KeyKind::rsa3072:
            return EVP_RSA_gen(3072U);
        case KeyKind::ed25519:
            return EVP_PKEY_Q_keygen(nullptr, nullptr, "ED25519");
    }
    return nullptr;
}

NameHandle makeName(const DistinguishedName& name) {
    NameHandle result(X509_NAME_new());
    for (const auto& [attribute, value] : name) {
        require(X509_NAME_add_entry_by_txt(result.get(), attribute.c_str(), MBSTRING_UTF8,
                                           unsignedText(value), static_cast<int>(value.size()), -1, 0) == 1,
                "bad name attribute");
    }
    return result;
}

void addExtension(X509* certificate, const ExtensionField& field) {
    const ObjectHandle oid(OBJ_txt2obj(field.oid.c_str(), 1));
    require(oid != nullptr, "bad extension OID");
    const crypto::OctetStringHandle value(ASN1_OCTET_STRING_new());
    require(ASN1_OCTET_STRING_set(value.get(), unsignedBytes(field.value),
                                  static_cast<int>(field.value.size())) == 1,
            "bad extension value");
    const ExtensionHandle extension(
        X509_EXTENSION_create_by_OBJ(nullptr, oid.get(), field.critical ? 1 : 0, value.get()));
    require(X509_add_ext(certificate, extension.get(), -1) == 1, "cannot add extension");
}

/// An extension in the words of openssl.cnf.
void addNamedExtension(X509* certificate, int nid, const std::string& words) {
    if (words.empty()) return;
    X509V3_CTX context;
    X509V3_set_ctx(&context, certificate, certificate, nullptr, nullptr, 0);
    const ExtensionHandle extension(X509V3_EXT_nconf_nid(nullptr, &context, nid, words.c_str()));
    require(extension != nullptr, words.c_str());
    require(X509_add_ext(certificate, extension.get(), -1) == 1, "cannot add extension");
}

void addBasicConstraints(X509* certificate, const std::optional<BasicConstraints>& constraints) {
    if (!constraints) return;
    std::string words = constraints->critical ? "critical," : "";
    words += constraints->isCertificateAuthority ? "CA:TRUE" : "CA:FALSE";
    if (constraints->pathLength) words += ",pathlen:" + std::to_string(*constraints->pathLength);
    addNamedExtension(certificate, NID_basic_constraints, words);
}

Data shortElement(std::uint8_t tag, ByteView content) {
    require(content.size() < 128, "key identifier too long for a short length");
    return ByteWriter().u8(tag).u8(static_cast<std::uint8_t>(content.size())).bytes(content).data();
}

std::optional<Data> resolve(const KeyIdentifier& identifier, const std::optional<Data>& computed) {
    switch (identifier.kind) {
        case KeyIdentifier::Kind::computed:
            return computed;
        case KeyIdentifier::Kind::omitted:
            return std::nullopt;
        case KeyIdentifier::Kind::given:
            return identifier.value;
    }
    return std::nullopt;
}

/// RFC 5280, 4.2.1.2, method (1): SHA-1 of the subjectPublicKey bit string.
Data publicKeyDigest(X509* certificate) {
    Data digest(SHA_DIGEST_LENGTH);
    unsigned size = 0;
    require(X509_pubkey_digest(certificate, EVP_sha1(), unsignedBytes(digest), &size) == 1, "digest");
    return digest;
}

const EVP_MD* messageDigest(SignatureDigest digest) {
    switch (digest) {
        case SignatureDigest::md5:
            return EVP_md5();
        case SignatureDigest::sha1:
            return EVP_sha1();
        case SignatureDigest::sha256:
            return EVP_sha256();
        case SignatureDigest::sha384:
            return EVP_sha384();
    }
    return nullptr;
}

void addExtensions(X509* certificate, const CertificateFields& fields, const std::optional<Data>& subjectId,
                   const std::optional<Data>& authorityId) {
    addBasicConstraints(certificate, fields.basicConstraints);
    addNamedExtension(certificate, NID_key_usage, fields.keyUsage);
    addNamedExtension(certificate, NID_ext_key_usage, fields.extendedKeyUsage);
    addNamedExtension(certificate, NID_subject_alt_name, fields.subjectAlternativeNames);
    addNamedExtension(certificate, NID_name_constraints, fields.nameConstraints);
    if (subjectId) addExtension(certificate, {"2.5.29.14", false, shortElement(0x04, *subjectId)});
    if (authorityId) {
        addExtension(certificate, {"2.5.29.35", false, shortElement(0x30, shortElement(0x80, *authorityId))});
    }
    for (const std::string& marker : fields.markers) addExtension(certificate, {marker});
    for (const ExtensionField& extension : fields.extensions) addExtension(certificate, extension);
}

/// A context that signs according to the fields. `choices` belongs to it.
DigestContextHandle signingContext(const SigningKey& signer, const CertificateFields& fields) {
    const bool choosesDigest = EVP_PKEY_is_a(signer.native(), "ED25519") != 1;
    const EVP_MD* const digest =
        fields.pss ? messageDigest(fields.pss->digest) : messageDigest(fields.digest);
    DigestContextHandle context(EVP_MD_CTX_new());
    EVP_PKEY_CTX* choices = nullptr;
    require(context && EVP_DigestSignInit(context.get(), &choices, choosesDigest ? digest : nullptr, nullptr,
                                          signer.native()) == 1,
            "signing");
    if (fields.pss) {
        require(EVP_PKEY_CTX_set_rsa_padding(choices, RSA_PKCS1_PSS_PADDING) == 1 &&
                    EVP_PKEY_CTX_set_rsa_mgf1_md(choices, messageDigest(fields.pss->mask)) == 1 &&
                    EVP_PKEY_CTX_set_rsa_pss_saltlen(choices, RSA_PSS_SALTLEN_DIGEST) == 1,
                "PSS");
    }
    return context;
}

void sign(X509* certificate, const SigningKey& signer, const CertificateFields& fields) {
    require(X509_sign_ctx(certificate, signingContext(signer, fields).get()) > 0, "signing");
}

Data endToEnd(std::initializer_list<Data> parts) {
    ByteWriter writer;
    for (const Data& part : parts) writer.bytes(part);
    return std::move(writer).take();
}

constexpr int kOrdinaryVersion = 3;

/// The certificate after the edit, under a signature that is as good as before.
Data edited(const Data& der, const CertificateFields& fields, const SigningKey& signer) {
    CertificateElements all = takeApart(der);
    if (fields.version != kOrdinaryVersion) {
        const auto number = static_cast<std::uint8_t>(fields.version - 1);
        all.version =
            fields.version == 1 ? Data{} : derElement(0xA0, derElement(0x02, ByteWriter().u8(number).data()));
    }
    if (fields.edit) fields.edit(all);
    const Data body = derElement(
        0x30,
        endToEnd({all.version, all.serialNumber, all.innerAlgorithm, all.issuer, all.validity, all.subject,
                  all.key, all.issuerUniqueIdentifier, all.subjectUniqueIdentifier, all.extensions}));
    if (!all.signature) {
        const DigestContextHandle context = signingContext(signer, fields);
        std::size_t size = 0;
        require(EVP_DigestSign(context.get(), nullptr, &size, unsignedBytes(body), body.size()) == 1,
                "signing");
        Data bits(size);
        require(
            EVP_DigestSign(context.get(), unsignedBytes(bits), &size, unsignedBytes(body), body.size()) == 1,
            "signing");
        bits.resize(size);
        all.signature = derElement(0x03, ByteWriter().u8(0).bytes(bits).data());
    }
    return derElement(0x30, endToEnd({body, all.outerAlgorithm, *all.signature}));
}

}  // namespace

CertificateElements takeApart(ByteView certificate) {
    const auto whole = trust::der::readElement(certificate);
    require(whole.has_value(), "no certificate");
    ByteView rest = whole->contents;
    const auto take = [&rest] {
        const auto element = trust::der::readElement(rest);
        require(element.has_value(), "a part of the certificate is missing");
        rest = rest.subspan(element->whole.size());
        return base::toData(element->whole);
    };
    const auto takeIf = [&](std::uint8_t tag) {
        return !rest.empty() && rest.front() == std::byte{tag} ? take() : Data{};
    };
    const Data body = take();
    CertificateElements all;
    all.outerAlgorithm = take();
    rest = trust::der::readElement(body)->contents;
    all.version = takeIf(0xA0);
    for (Data* part :
         {&all.serialNumber, &all.innerAlgorithm, &all.issuer, &all.validity, &all.subject, &all.key})
        *part = take();
    all.issuerUniqueIdentifier = takeIf(0x81);
    all.subjectUniqueIdentifier = takeIf(0x82);
    all.extensions = takeIf(0xA3);
    return all;
}

SigningKey SigningKey::generate(KeyKind kind) {
    EVP_PKEY* const pair = generatePair(kind);
    require(pair != nullptr, "key generation failed");
    return SigningKey(std::shared_ptr<EVP_PKEY>(pair, EVP_PKEY_free));
}

SigningKey SigningKey::onCurve(const char* curve) {
    EVP_PKEY* const pair = EVP_EC_gen(curve);
    require(pair != nullptr, curve);
    return SigningKey(std::shared_ptr<EVP_PKEY>(pair, EVP_PKEY_free));
}

SigningKey SigningKey::cached(KeyKind kind, const std::string& name) {
    static std::mutex mutex;
    static std::map<std::pair<KeyKind, std::string>, SigningKey> keys;
    const std::lock_guard lock(mutex);
    const auto found = keys.find({kind, name});
    if (found != keys.end()) return found->second;
    return keys.emplace(std::pair{kind, name}, generate(kind)).first->second;
}

std::string SigningKey::pem() const {
    const BioHandle bio(BIO_new(BIO_s_mem()));
    require(PEM_write_bio_PrivateKey(bio.get(), native(), nullptr, nullptr, 0, nullptr, nullptr) == 1, "PEM");
    return textOf(bio.get());
}

Data SigningKey::publicKeyInfo() const {
    return crypto::encodedBy<EVP_PKEY>(i2d_PUBKEY, native());
}

Data SigningKey::sign(ByteView message) const {
    const DigestContextHandle context(EVP_MD_CTX_new());
    require(EVP_DigestSignInit(context.get(), nullptr, EVP_sha256(), nullptr, native()) == 1, "sign");
    std::size_t size = 0;
    require(EVP_DigestSign(context.get(), nullptr, &size, unsignedBytes(message), message.size()) == 1,
            "sign");
    Data signature(size);
    require(EVP_DigestSign(context.get(), unsignedBytes(signature), &size, unsignedBytes(message),
                           message.size()) == 1,
            "sign");
    signature.resize(size);
    return signature;
}

std::string toPem(std::string_view label, ByteView der) {
    const BioHandle bio(BIO_new(BIO_s_mem()));
    require(PEM_write_bio(bio.get(), std::string(label).c_str(), "", unsignedBytes(der),
                          static_cast<long>(der.size())) > 0,
            "PEM");
    return textOf(bio.get());
}

std::string IssuedCertificate::pem() const {
    return toPem("CERTIFICATE", der);
}

IssuedCertificate issueCertificate(const CertificateFields& fields, const IssuedCertificate* issuer) {
    const CertificateHandle certificate(X509_new());
    const DistinguishedName& issuerName = issuer != nullptr ? issuer->subject : fields.subject;
    const SigningKey signer = fields.signer.value_or(issuer != nullptr ? issuer->key : fields.key);

    require(X509_set_version(certificate.get(), X509_VERSION_3) == 1, "version");
    require(ASN1_INTEGER_set_int64(X509_get_serialNumber(certificate.get()), fields.serial) == 1, "serial");
    require(X509_set_subject_name(certificate.get(), makeName(fields.subject).get()) == 1, "subject");
    require(X509_set_issuer_name(certificate.get(), makeName(fields.issuer.value_or(issuerName)).get()) == 1,
            "issuer");
    require(ASN1_TIME_set(X509_getm_notBefore(certificate.get()), fields.notBefore.seconds) != nullptr,
            "date");
    require(ASN1_TIME_set(X509_getm_notAfter(certificate.get()), fields.notAfter.seconds) != nullptr, "date");
    require(X509_set_pubkey(certificate.get(), fields.key.native()) == 1, "key");

    const std::optional<Data> subjectId =
        resolve(fields.subjectKeyIdentifier, publicKeyDigest(certificate.get()));
    const std::optional<Data> issuerId = issuer != nullptr ? issuer->subjectKeyIdentifier : subjectId;
    addExtensions(certificate.get(), fields, subjectId, resolve(fields.authorityKeyIdentifier, issuerId));

    sign(certificate.get(), signer, fields);
    IssuedCertificate issued{crypto::encodedBy<X509>(i2d_X509, certificate.get()), fields.key, fields.subject,
                             subjectId};
    if (fields.edit || fields.version != kOrdinaryVersion) issued.der = edited(issued.der, fields, signer);
    if (fields.corruptSignature) issued.der.back() ^= std::byte{1};
    return issued;
}

namespace {

/// (r, n - s) for (r, s), both in DER.
Data otherSignature(ByteView signature, const SigningKey& signer) {
    const unsigned char* at = unsignedBytes(signature);
    const EcdsaSignatureHandle given(d2i_ECDSA_SIG(nullptr, &at, static_cast<long>(signature.size())));
    require(given != nullptr, "no elliptic-curve signature");
    BIGNUM* order = nullptr;
    require(EVP_PKEY_get_bn_param(signer.native(), OSSL_PKEY_PARAM_EC_ORDER, &order) == 1, "no order");
    const NumberHandle owned(order);
    NumberHandle r(BN_dup(ECDSA_SIG_get0_r(given.get())));
    NumberHandle s(BN_new());
    const EcdsaSignatureHandle other(ECDSA_SIG_new());
    require(r && s && other && BN_sub(s.get(), order, ECDSA_SIG_get0_s(given.get())) == 1, "n - s");
    require(ECDSA_SIG_set0(other.get(), r.release(), s.release()) == 1, "signature");
    return crypto::encodedBy<ECDSA_SIG>(i2d_ECDSA_SIG, other.get());
}

}  // namespace

Data underOtherSignature(ByteView certificate, const SigningKey& issuer) {
    const auto whole = trust::der::readElement(certificate);
    require(whole.has_value(), "no certificate");
    const auto body = trust::der::readElement(whole->contents);
    require(body.has_value(), "no body");
    const auto algorithm = trust::der::readElement(whole->contents.subspan(body->whole.size()));
    require(algorithm.has_value(), "no algorithm");
    const std::size_t signedSize = body->whole.size() + algorithm->whole.size();
    const auto bits = trust::der::readElement(whole->contents.subspan(signedSize));
    require(bits.has_value() && !bits->contents.empty(), "no signature");
    const Data other = otherSignature(bits->contents.subspan(1), issuer);  // after the count of unused bits
    return derElement(0x30, ByteWriter()
                                .bytes(whole->contents.first(signedSize))
                                .bytes(derElement(0x03, ByteWriter().u8(0).bytes(other).data()))
                                .data());
}

std::vector<Data> IssuedChain::list(bool withRoot) const {
    std::vector<Data> certificates{leaf.der, intermediate.der};
    if (withRoot) certificates.push_back(root.der);
    return certificates;
}

IssuedChain ChainFields::issue() const {
    IssuedCertificate top = issueCertificate(root, nullptr);
    IssuedCertificate middle = issueCertificate(intermediate, &top);
    IssuedCertificate bottom = issueCertificate(leaf, &middle);
    return {std::move(top), std::move(middle), std::move(bottom)};
}

namespace {

void makeAuthorities(ChainFields& chain, const std::string& purpose) {
    chain.root.subject = {{"O", "Ostrel"}, {"CN", purpose + " Root"}};
    chain.root.key = SigningKey::cached(KeyKind::p256, purpose + " Root");
    chain.root.basicConstraints = BasicConstraints{true};
    chain.root.keyUsage = "critical,keyCertSign,cRLSign";
    chain.root.serial = 1;

    chain.intermediate.subject = {{"O", "Ostrel"}, {"CN", purpose + " Intermediate"}};
    chain.intermediate.key = SigningKey::cached(KeyKind::p256, purpose + " Intermediate");
    chain.intermediate.basicConstraints = BasicConstraints{true, 0};
    chain.intermediate.keyUsage = "critical,keyCertSign,cRLSign";
    chain.intermediate.serial = 2;

    chain.leaf.key = SigningKey::cached(KeyKind::p256, purpose + " Leaf");
    chain.leaf.keyUsage = "critical,digitalSignature";
    chain.leaf.serial = 3;
}

bool isAddress(const std::string& host) {
    in6_addr address{};
    return inet_pton(AF_INET, host.c_str(), &address) == 1 ||
           inet_pton(AF_INET6, host.c_str(), &address) == 1;
}

}  // namespace

TicketChain::TicketChain() {
    makeAuthorities(*this, "Ticket");
    intermediate.markers = {kTicketIntermediateMarker};
    leaf.subject = {{"O", "Ostrel"}, {"CN", "Ticket Signer"}};
    leaf.markers = {kTicketLeafMarker};
}

ServerChain::ServerChain(const std::string& host) {
    makeAuthorities(*this, "Server");
    leaf.subject = {{"O", "Ostrel"}, {"CN", "Record Service"}};
    leaf.extendedKeyUsage = "serverAuth";
    leaf.subjectAlternativeNames = (isAddress(host) ? "IP:" : "DNS:") + host;
    leaf.markers = {kPinnedServerMarker};
}

}  // namespace pinwell::test
