#include "codesign/cms_signature.h"

#include <openssl/bio.h>
#include <openssl/cms.h>
#include <openssl/evp.h>
#include <openssl/ts.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <ctime>

#include "trust/openssl.h"

namespace pinwell::codesign {

using foundation::ByteView;
using foundation::Date;
using trust::byteView;
using trust::ErrorQueueGuard;
using trust::unsignedBytes;

namespace {

using Message = foundation::Handle<CMS_ContentInfo, CMS_ContentInfo_free>;
using Bio = foundation::Handle<BIO, BIO_free_all>;
using TstInfo = foundation::Handle<TS_TST_INFO, TS_TST_INFO_free>;

/// A SignedData that fills `bytes`; nothing otherwise.
Message parseSignedData(ByteView bytes) {
    if (bytes.empty() || bytes.size() > kMaximumCmsLength) return nullptr;
    const unsigned char* cursor = unsignedBytes(bytes);
    Message message(d2i_CMS_ContentInfo(nullptr, &cursor, static_cast<long>(bytes.size())));
    if (!message || cursor != unsignedBytes(bytes) + bytes.size()) return nullptr;
    if (OBJ_obj2nid(CMS_get0_type(message.get())) != NID_pkcs7_signed) return nullptr;
    return message;
}

CMS_SignerInfo* firstSigner(const Message& message) {
    STACK_OF(CMS_SignerInfo)* signers = CMS_get0_SignerInfos(message.get());
    if (signers == nullptr || sk_CMS_SignerInfo_num(signers) < 1) return nullptr;
    return sk_CMS_SignerInfo_value(signers, 0);
}

constexpr unsigned kVerifyFlags = CMS_BINARY | CMS_NO_SIGNER_CERT_VERIFY;

/// Whether `imprint` is the digest of `bytes` under its own algorithm.
bool imprintMatches(TS_MSG_IMPRINT* imprint, ByteView bytes) {
    const ASN1_OBJECT* algorithm = nullptr;
    X509_ALGOR_get0(&algorithm, nullptr, nullptr, TS_MSG_IMPRINT_get_algo(imprint));
    const EVP_MD* digest = EVP_get_digestbyobj(algorithm);
    if (digest == nullptr) return false;
    std::array<unsigned char, EVP_MAX_MD_SIZE> value = {};
    unsigned length = 0;
    if (EVP_Digest(bytes.data(), bytes.size(), value.data(), &length, digest, nullptr) != 1) return false;
    const ByteView computed = std::as_bytes(std::span(value)).first(length);
    const ByteView stated = byteView(TS_MSG_IMPRINT_get_msg(imprint));
    return std::equal(computed.begin(), computed.end(), stated.begin(), stated.end());
}

std::optional<Date> dateFrom(const ASN1_GENERALIZEDTIME* time) {
    std::tm parts = {};
    if (time == nullptr || ASN1_TIME_to_tm(time, &parts) != 1) return std::nullopt;
    using namespace std::chrono;
    const sys_days day = year(parts.tm_year + 1900) / month(static_cast<unsigned>(parts.tm_mon + 1)) /
                         std::chrono::day(static_cast<unsigned>(parts.tm_mday));
    const seconds moment =
        day.time_since_epoch() + hours(parts.tm_hour) + minutes(parts.tm_min) + seconds(parts.tm_sec);
    return Date{moment.count()};
}

/// The content of a time-stamp token whose own signature verifies.
TstInfo verifiedTokenContent(ByteView token) {
    const Message message = parseSignedData(token);
    if (!message || firstSigner(message) == nullptr) return nullptr;
    if (OBJ_obj2nid(CMS_get0_eContentType(message.get())) != NID_id_smime_ct_TSTInfo) return nullptr;
    if (CMS_is_detached(message.get()) != 0) return nullptr;
    if (CMS_verify(message.get(), nullptr, nullptr, nullptr, nullptr, kVerifyFlags) != 1) return nullptr;
    const ByteView content = byteView(*CMS_get0_content(message.get()));
    const unsigned char* cursor = unsignedBytes(content);
    TstInfo info(d2i_TS_TST_INFO(nullptr, &cursor, static_cast<long>(content.size())));
    if (!info || cursor != unsignedBytes(content) + content.size()) return nullptr;
    return info;
}

}  // namespace

bool verifyDetachedCms(ByteView cms, ByteView content) {
    const ErrorQueueGuard guard;
    const Message message = parseSignedData(cms);
    if (!message || firstSigner(message) == nullptr) return false;
    if (CMS_is_detached(message.get()) != 1) return false;
    const Bio data(BIO_new_mem_buf(content.data(), static_cast<int>(content.size())));
    return data && CMS_verify(message.get(), nullptr, nullptr, data.get(), nullptr, kVerifyFlags) == 1;
}

std::optional<Date> secureTimestamp(ByteView cms) {
    const ErrorQueueGuard guard;
    const Message message = parseSignedData(cms);
    CMS_SignerInfo* signer = message ? firstSigner(message) : nullptr;
    if (signer == nullptr) return std::nullopt;
    // -3: exactly one such attribute with exactly one value; with more, none of them could be preferred.
    const void* attribute = CMS_unsigned_get0_data_by_OBJ(signer, OBJ_nid2obj(NID_id_smime_aa_timeStampToken),
                                                          -3, V_ASN1_SEQUENCE);
    if (attribute == nullptr) return std::nullopt;
    const TstInfo info = verifiedTokenContent(byteView(static_cast<const ASN1_STRING*>(attribute)));
    if (!info) return std::nullopt;
    const ByteView signature = byteView(CMS_SignerInfo_get0_signature(signer));
    if (!imprintMatches(TS_TST_INFO_get_msg_imprint(info.get()), signature)) return std::nullopt;
    return dateFrom(TS_TST_INFO_get_time(info.get()));
}

}  // namespace pinwell::codesign
