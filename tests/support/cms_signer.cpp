#include "support/cms_signer.h"

#include <openssl/bio.h>
#include <openssl/cms.h>
#include <openssl/evp.h>
#include <openssl/rsa.h>
#include <openssl/ts.h>
#include <openssl/x509.h>
#include <openssl/x509v3.h>

#include "base/handle.h"
#include "crypto/openssl.h"
#include "support/cms_parts.h"
#include "support/code_directory_builder.h"
#include "support/require.h"

namespace pinwell::test {

namespace {

using crypto::BioHandle;
using crypto::MessageHandle;
using crypto::ObjectHandle;
using crypto::unsignedBytes;

using TstInfo = base::Handle<TS_TST_INFO, TS_TST_INFO_free>;
using Imprint = base::Handle<TS_MSG_IMPRINT, TS_MSG_IMPRINT_free>;
using Integer = base::Handle<ASN1_INTEGER, ASN1_INTEGER_free>;
using Time = base::Handle<ASN1_GENERALIZEDTIME, ASN1_GENERALIZEDTIME_free>;

struct Identity {
    crypto::KeyHandle key;
    crypto::CertificateHandle certificate;
};

Identity makeIdentity(TestKey kind) {
    Identity identity;
    identity.key.reset(kind == TestKey::ecP256 ? EVP_EC_gen("P-256") : EVP_RSA_gen(2048));
    require(identity.key != nullptr, "key");
    identity.certificate.reset(X509_new());
    X509* certificate = identity.certificate.get();
    require(certificate != nullptr && X509_set_version(certificate, 2) == 1, "certificate");
    ASN1_INTEGER_set(X509_get_serialNumber(certificate), 1);
    // Already expired: a reader of code signatures must ignore the dates.
    ASN1_TIME_set_string_X509(X509_getm_notBefore(certificate), "20200101000000Z");
    ASN1_TIME_set_string_X509(X509_getm_notAfter(certificate), "20200102000000Z");
    X509_NAME* name = X509_get_subject_name(certificate);
    const unsigned char text[] = "Test signer";
    X509_NAME_add_entry_by_txt(name, "CN", MBSTRING_ASC, text, -1, -1, 0);
    X509_set_issuer_name(certificate, name);
    X509_set_pubkey(certificate, identity.key.get());
    X509V3_CTX context;
    X509V3_set_ctx(&context, certificate, certificate, nullptr, nullptr, 0);
    const crypto::ExtensionHandle identifier(
        X509V3_EXT_conf_nid(nullptr, &context, NID_subject_key_identifier, "hash"));
    require(identifier && X509_add_ext(certificate, identifier.get(), -1) == 1, "key identifier");
    require(X509_sign(certificate, identity.key.get(), EVP_sha256()) > 0, "certificate signature");
    return identity;
}

const Identity& identityWith(TestKey kind) {
    static const Identity ec = makeIdentity(TestKey::ecP256);
    static const Identity rsa = makeIdentity(TestKey::rsa2048);
    return kind == TestKey::ecP256 ? ec : rsa;
}

BioHandle reader(ByteView bytes) {
    return BioHandle(BIO_new_mem_buf(bytes.data(), static_cast<int>(bytes.size())));
}

CMS_SignerInfo* signerOf(const MessageHandle& message) {
    return sk_CMS_SignerInfo_value(CMS_get0_SignerInfos(message.get()), 0);
}

/// One signer's message over `content`; `flags` of CMS_sign.
MessageHandle signMessage(const Identity& identity, int contentType, ByteView content, unsigned flags,
                          bool pss = false) {
    flags |= CMS_BINARY | (pss ? CMS_KEY_PARAM : 0U);
    MessageHandle message(CMS_sign(nullptr, nullptr, nullptr, nullptr, flags | CMS_PARTIAL));
    require(message != nullptr, "message");
    ObjectHandle type(OBJ_dup(OBJ_nid2obj(contentType)));
    require(CMS_set1_eContentType(message.get(), type.get()) == 1, "content type");
    CMS_SignerInfo* const signer =
        CMS_add1_signer(message.get(), identity.certificate.get(), identity.key.get(), EVP_sha256(), flags);
    require(signer != nullptr, "signer");
    if (pss) {
        EVP_PKEY_CTX* const choices = CMS_SignerInfo_get0_pkey_ctx(signer);
        // The library's own choice differs between its versions.
        require(EVP_PKEY_CTX_set_rsa_padding(choices, RSA_PKCS1_PSS_PADDING) == 1 &&
                    EVP_PKEY_CTX_set_rsa_pss_saltlen(choices, CmsBuilder::kPssSaltLength) == 1,
                "padding");
    }
    require(CMS_final(message.get(), reader(content).get(), nullptr, flags) == 1, "signature");
    return message;
}

void breakSignature(const MessageHandle& message) {
    ASN1_OCTET_STRING* value = CMS_SignerInfo_get0_signature(signerOf(message));
    Data bytes = base::toData(crypto::byteView(value));
    bytes.back() ^= std::byte{1};
    ASN1_OCTET_STRING_set(value, unsignedBytes(bytes), static_cast<int>(bytes.size()));
}

}  // namespace

TimestampBuilder& TimestampBuilder::time(std::string value) {
    time_ = std::move(value);
    return *this;
}

TimestampBuilder& TimestampBuilder::imprintOf(Data bytes) {
    imprinted_ = std::move(bytes);
    return *this;
}

TimestampBuilder& TimestampBuilder::imprintDigest(std::uint8_t type) {
    imprintDigest_ = type;
    return *this;
}

TimestampBuilder& TimestampBuilder::brokenSignature() {
    broken_ = true;
    return *this;
}

TimestampBuilder& TimestampBuilder::withoutCertificate() {
    certificate_ = false;
    return *this;
}

TimestampBuilder& TimestampBuilder::asPlainData() {
    plainData_ = true;
    return *this;
}

Data TimestampBuilder::build(ByteView signatureValue) const {
    const Data digest = codeDigest(imprintDigest_, imprinted_ ? ByteView(*imprinted_) : signatureValue);
    Data octets = digest;
    const crypto::AlgorithmHandle algorithm(X509_ALGOR_new());
    X509_ALGOR_set_md(algorithm.get(), imprintDigest_ == 4 ? EVP_sha384() : EVP_sha256());
    const Imprint imprint(TS_MSG_IMPRINT_new());
    TS_MSG_IMPRINT_set_algo(imprint.get(), algorithm.get());
    TS_MSG_IMPRINT_set_msg(imprint.get(), unsignedBytes(octets), static_cast<int>(octets.size()));

    const TstInfo info(TS_TST_INFO_new());
    const ObjectHandle policy(OBJ_txt2obj("1.2.3.4", 1));
    const Integer serial(ASN1_INTEGER_new());
    ASN1_INTEGER_set(serial.get(), 7);
    const Time time(ASN1_GENERALIZEDTIME_new());
    ASN1_STRING_set(time.get(), time_.data(), static_cast<int>(time_.size()));
    require(TS_TST_INFO_set_version(info.get(), 1) == 1 &&
                TS_TST_INFO_set_policy_id(info.get(), policy.get()) == 1 &&
                TS_TST_INFO_set_msg_imprint(info.get(), imprint.get()) == 1 &&
                TS_TST_INFO_set_serial(info.get(), serial.get()) == 1 &&
                TS_TST_INFO_set_time(info.get(), time.get()) == 1,
            "time stamp");

    const MessageHandle token = signMessage(
        identityWith(TestKey::rsa2048), plainData_ ? NID_pkcs7_data : NID_id_smime_ct_TSTInfo,
        crypto::encodedBy<TS_TST_INFO>(i2d_TS_TST_INFO, info.get()), certificate_ ? 0 : CMS_NOCERTS);
    if (broken_) breakSignature(token);
    return crypto::encodedBy<CMS_ContentInfo>(i2d_CMS_ContentInfo, token.get());
}

CmsBuilder::CmsBuilder(Data content) : content_(std::move(content)) {}

CmsBuilder& CmsBuilder::key(TestKey value) {
    key_ = value;
    return *this;
}

CmsBuilder& CmsBuilder::ber() {
    ber_ = true;
    return *this;
}

CmsBuilder& CmsBuilder::withoutCertificate() {
    certificate_ = false;
    return *this;
}

CmsBuilder& CmsBuilder::attached() {
    attached_ = true;
    return *this;
}

CmsBuilder& CmsBuilder::withoutSignedAttributes() {
    signedAttributes_ = false;
    return *this;
}

CmsBuilder& CmsBuilder::byKeyIdentifier() {
    keyIdentifier_ = true;
    return *this;
}

CmsBuilder& CmsBuilder::pss() {
    pss_ = true;
    return *this;
}

CmsBuilder& CmsBuilder::brokenSignature() {
    broken_ = true;
    return *this;
}

CmsBuilder& CmsBuilder::timestamp(TimestampBuilder token) {
    timestamps_.push_back(std::move(token));
    return *this;
}

Data CmsBuilder::build() const {
    unsigned flags = 0;
    if (!attached_) flags |= CMS_DETACHED;
    if (!certificate_) flags |= CMS_NOCERTS;
    if (!signedAttributes_) flags |= CMS_NOATTR;
    if (keyIdentifier_) flags |= CMS_USE_KEYID;
    const MessageHandle message = signMessage(identityWith(key_), NID_pkcs7_data, content_, flags, pss_);
    CMS_SignerInfo* signer = signerOf(message);
    for (const TimestampBuilder& timestamp : timestamps_) {
        const Data token = timestamp.build(crypto::byteView(CMS_SignerInfo_get0_signature(signer)));
        require(CMS_unsigned_add1_attr_by_NID(signer, NID_id_smime_aa_timeStampToken, V_ASN1_SEQUENCE,
                                              token.data(), static_cast<int>(token.size())) == 1,
                "time stamp attribute");
    }
    if (broken_) breakSignature(message);
    const Data der = crypto::encodedBy<CMS_ContentInfo>(i2d_CMS_ContentInfo, message.get());
    return ber_ ? withIndefiniteLengths(der, 4) : der;
}

}  // namespace pinwell::test
