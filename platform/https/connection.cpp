#include "connection.h"

#include <curl/curl.h>
#include <openssl/ssl.h>
#include <openssl/x509.h>
#include <openssl/x509_vfy.h>
#include <poll.h>

#include <algorithm>
#include <array>
#include <exception>
#include <optional>
#include <span>
#include <string_view>
#include <utility>

#include "base/handle.h"
#include "crypto/openssl.h"
#include "transfer_error.h"

namespace pinwell::https {
namespace {

std::string partOf(CURLU* address, CURLUPart part, unsigned flags) {
    char* text = nullptr;
    if (curl_url_get(address, part, &text, flags) != CURLUE_OK) return {};
    const base::Handle<char, curl_free> owner(text);
    return text;
}

// In the authority, which ends where the path, query or fragment begins (RFC 3986, section 3.2).
bool namesUser(std::string_view text) {
    constexpr std::string_view kMark = "://";
    text.remove_prefix(std::min(text.find(kMark), text.size() - kMark.size()) + kMark.size());
    return text.substr(0, text.find_first_of("/?#")).find('@') != std::string_view::npos;
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
        list.push_back(crypto::encodedBy<X509>(i2d_X509, certificate));
        return !list.back().empty();
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

void AddressDeleter::operator()(Curl_URL* address) const noexcept {
    curl_url_cleanup(address);
}

Result<Target> targetOf(const values::URL& url) {
    const std::string text = url.absoluteString();
    const auto refuse = [&text](std::string_view why) {
        return makeError(URLErrorCode::unsupportedURL, "The URL \"" + text + "\" " + std::string(why) + ".");
    };
    if (url.scheme() != "https") return refuse("is not an https URL");
    if (namesUser(text))  // its text would show the password
        return makeError(URLErrorCode::unsupportedURL,
                         "The URL for \"" + url.host() + "\" holds a user name, which is not supported.");
    Target target{AddressHandle(curl_url()), {}, {}};
    const CURLUcode code =
        curl_url_set(target.address.get(), CURLUPART_URL, text.c_str(), CURLU_DISALLOW_USER);
    if (code != CURLUE_OK) return refuse("is malformed");
    target.host = partOf(target.address.get(), CURLUPART_HOST, 0);
    target.port = partOf(target.address.get(), CURLUPART_PORT, CURLU_DEFAULT_PORT);
    if (target.host.starts_with('[') && target.host.ends_with(']'))
        target.host = target.host.substr(1, target.host.size() - 2);
    // The judged name must be the name of the connection, in any spelling.
    const CaseInsensitiveLess less;
    if (less(target.host, url.host()) || less(url.host(), target.host))
        return refuse("has an ambiguous host");
    target.host = url.host();
    return target;
}

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

void ConnectionSlot::HandleDeleter::operator()(void* handle) const noexcept {
    curl_multi_cleanup(handle);
}

ConnectionSlot::ConnectionSlot() = default;
ConnectionSlot::~ConnectionSlot() = default;

void* ConnectionSlot::handleFor(const Target& target) {
    if (!handle_ || target.host != host_ || target.port != port_ || !isQuiet()) drop();
    if (!handle_) {
        handle_.reset(curl_multi_init());
        host_ = target.host;
        port_ = target.port;
        if (handle_ && curl_multi_setopt(handle_.get(), CURLMOPT_MAXCONNECTS, 1L) != CURLM_OK) drop();
    }
    socket_ = -1;
    return handle_.get();
}

// Between two exchanges of HTTP/1 a server must not send anything. Readable bytes are its end, or would be
// read as the next response. HTTP/2 numbers its responses, and the library checks for its end itself.
bool ConnectionSlot::isQuiet() const noexcept {
    if (socket_ < 0 || !trust_) return false;
    if (trust_->agreedOnHTTP2()) return true;
    pollfd connection{socket_, POLLIN, 0};
    return ::poll(&connection, 1, 0) == 0;
}

bool ConnectionSlot::prepare(void* tlsContext, ServerTrust::Judge judge) noexcept {
    localPort_ = 0;
    trust_ = ServerTrust::install(tlsContext, std::move(judge));
    return trust_ != nullptr;
}

bool ConnectionSlot::confirm(int localPort) noexcept {
    if (!trust_ || !trust_->accepted()) return false;
    if (localPort_ == 0) localPort_ = localPort;
    return localPort_ == localPort;
}

void ConnectionSlot::keep(int socket) noexcept {
    if (trust_) trust_->forgetJudge();
    socket_ = socket;
    if (socket_ < 0) drop();
}

void ConnectionSlot::drop() noexcept {
    handle_.reset();
    trust_.reset();
    localPort_ = 0;
    socket_ = -1;
}

}  // namespace pinwell::https
