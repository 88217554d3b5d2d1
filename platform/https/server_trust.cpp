#include "https/server_trust.h"

#include <openssl/ssl.h>
#include <openssl/x509.h>
#include <openssl/x509_vfy.h>

#include <algorithm>
#include <array>
#include <exception>
#include <memory>
#include <optional>

namespace pinwell::https {
namespace {

using foundation::Data;

struct OpenSSLFree {
    void operator()(unsigned char* bytes) const noexcept { OPENSSL_free(bytes); }
};

std::optional<Data> derOf(const X509* certificate) {
    unsigned char* bytes = nullptr;
    const int length = i2d_X509(certificate, &bytes);
    if (length <= 0) return std::nullopt;
    const std::unique_ptr<unsigned char, OpenSSLFree> owner(bytes);
    const auto view = std::as_bytes(std::span(bytes, static_cast<std::size_t>(length)));
    return Data(view.begin(), view.end());
}

// The server's certificates, the leaf first. `nullopt` if there are none, too many, or one that cannot be
// encoded.
std::optional<std::vector<Data>> peerCertificates(const X509_STORE_CTX* context) {
    const X509* const leaf = X509_STORE_CTX_get0_cert(context);
    STACK_OF(X509)* const sent = X509_STORE_CTX_get0_untrusted(context);
    const int count = sent != nullptr ? sk_X509_num(sent) : 0;
    if (leaf == nullptr || static_cast<std::size_t>(count) > kMaximumPeerCertificates) return std::nullopt;

    std::vector<Data> list;
    const auto add = [&list](const X509* certificate) {
        auto der = derOf(certificate);
        if (der) list.push_back(std::move(*der));
        return der.has_value();
    };
    if (!add(leaf)) return std::nullopt;
    for (int i = 0; i < count; ++i) {
        const X509* const certificate = sk_X509_value(sent, i);
        if (certificate != leaf && !add(certificate)) return std::nullopt;
    }
    return list;
}

// Decided before the certificates arrive, in each version of the handshake.
bool hasAgreedOnHTTP2(X509_STORE_CTX* context) {
    const auto* const connection =
        static_cast<SSL*>(X509_STORE_CTX_get_ex_data(context, SSL_get_ex_data_X509_STORE_CTX_idx()));
    const unsigned char* name = nullptr;
    unsigned int length = 0;
    SSL_get0_alpn_selected(connection, &name, &length);
    return length == 2 && name[0] == 'h' && name[1] == '2';
}

int verifyThunk(X509_STORE_CTX* context, void* self) {
    return static_cast<ServerTrust*>(self)->verify(context) ? 1 : 0;
}

// Gets the heads of records, and alerts (RFC 8446, sections 5.1 and 6). A head ends with the record's length;
// an alert is two bytes, level and description.
void messageThunk(int isWritten, int, int contentType, const void* bytes, std::size_t length, SSL*,
                  void* self) {
    if (isWritten != 0) return;
    auto& trust = *static_cast<ServerTrust*>(self);
    const auto* const octets = static_cast<const unsigned char*>(bytes);
    if (contentType == SSL3_RT_HEADER && length == SSL3_RT_HEADER_LENGTH)
        trust.noteRecord(length + (std::size_t{octets[3]} << 8U) + octets[4]);
    if (contentType != SSL3_RT_ALERT || length != 2) return;
    if (octets[1] == SSL_AD_CLOSE_NOTIFY)
        trust.noteOrderlyEnd();
    else
        trust.noteAlert(octets[1]);
}

void freeShare(void*, void* share, CRYPTO_EX_DATA*, int, long, void*) {
    const std::unique_ptr<std::shared_ptr<ServerTrust>> owner(
        static_cast<std::shared_ptr<ServerTrust>*>(share));
}

// The context's index for its share of the object.
int sharePlace() {
    static const int place = SSL_CTX_get_ex_new_index(0, nullptr, nullptr, nullptr, freeShare);
    return place;
}

}  // namespace

std::shared_ptr<ServerTrust> ServerTrust::install(void* context, Judge judge) noexcept {
    auto* const tls = static_cast<SSL_CTX*>(context);
    std::shared_ptr<ServerTrust> trust;
    try {
        trust = std::make_shared<ServerTrust>(std::move(judge));
        auto share = std::make_unique<std::shared_ptr<ServerTrust>>(trust);
        if (SSL_CTX_set_ex_data(tls, sharePlace(), share.get()) != 1) return nullptr;
        static_cast<void>(share.release());  // the context frees it
    } catch (const std::exception&) {
        return nullptr;  // the caller is C
    }
    SSL_CTX_set_cert_verify_callback(tls, verifyThunk, trust.get());
    SSL_CTX_set_verify(tls, SSL_VERIFY_PEER, nullptr);  // without it a refusal would be noted and ignored
    SSL_CTX_set_session_cache_mode(tls, SSL_SESS_CACHE_OFF);
    SSL_CTX_set_options(tls, SSL_OP_NO_TICKET | SSL_OP_NO_RENEGOTIATION);
    SSL_CTX_set_msg_callback(tls, messageThunk);
    SSL_CTX_set_msg_callback_arg(tls, trust.get());
    SSL_CTX_set_keylog_callback(tls,
                                nullptr);  // the environment could enable writing the keys to a file
    return SSL_CTX_set_min_proto_version(tls, TLS1_2_VERSION) == 1 ? trust : nullptr;
}

// RFC 8446, section 6.2: the alerts about the other side's certificate.
void ServerTrust::noteAlert(int description) noexcept {
    constexpr std::array kOfCertificates{SSL_AD_BAD_CERTIFICATE,     SSL_AD_UNSUPPORTED_CERTIFICATE,
                                         SSL_AD_CERTIFICATE_REVOKED, SSL_AD_CERTIFICATE_EXPIRED,
                                         SSL_AD_CERTIFICATE_UNKNOWN, SSL_AD_UNKNOWN_CA,
                                         SSL_AD_ACCESS_DENIED,       TLS13_AD_CERTIFICATE_REQUIRED};
    if (std::find(kOfCertificates.begin(), kOfCertificates.end(), description) == kOfCertificates.end())
        return;
    try {
        objection_ = SSL_alert_desc_string_long(description);
        if (description == TLS13_AD_CERTIFICATE_REQUIRED) objection_ = "certificate required";
    } catch (const std::exception&) {
        objection_.clear();  // the caller is C
    }
}

bool ServerTrust::verify(void* storeContext) noexcept {
    auto* const context = static_cast<X509_STORE_CTX*>(storeContext);
    agreedOnHTTP2_ = hasAgreedOnHTTP2(context);
    bool trusted = false;
    try {
        const auto certificates = peerCertificates(context);
        if (certificates && judge_) trusted = judge_(*certificates);
    } catch (const std::exception&) {
        trusted = false;  // the caller is C
    }
    asked_ = true;
    bytesArrived_ = 0;
    refused_ = refused_ || !trusted;
    X509_STORE_CTX_set_error(context, trusted ? X509_V_OK : X509_V_ERR_APPLICATION_VERIFICATION);
    return trusted;
}

}  // namespace pinwell::https
