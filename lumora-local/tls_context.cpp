#include "tls_context.h"

#include <openssl/ec.h>
#include <openssl/obj_mac.h>
#include <openssl/ssl.h>
#include <openssl/x509_vfy.h>
#include <sys/stat.h>

#include <algorithm>
#include <boost/asio/ssl/context.hpp>
#include <ctime>

#include "base/text.h"
#include "certificates.h"
#include "failure.h"
#include "key_file.h"
#include "openssl.h"
#include "trust/der.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using values::format;

constexpr std::size_t kMaximumAuthorities = 64;
constexpr std::size_t kMaximumCertificates = 8;
constexpr std::size_t kMaximumCertificateSize = std::size_t{16} * 1024;
constexpr long kMaximumMessageSize = 64L * 1024;
constexpr int kMaximumIntermediates = 4;
constexpr int kSecurityLevel = 2;  // 112 bits, for every system configuration
constexpr int kFewestRsaBits = 2048;
constexpr int kMostRsaBits = 8192;

using StoreHandle = base::Handle<X509_STORE, X509_STORE_free>;

struct OpenSSLFree {
    void operator()(unsigned char* bytes) const noexcept { OPENSSL_free(bytes); }
};

bool hasKnownCurve(EVP_PKEY* key) {
    std::array<char, 64> group{};
    std::size_t length = 0;
    if (EVP_PKEY_get_group_name(key, group.data(), group.size(), &length) != 1) return false;
    const std::string_view name(group.data());
    return name == SN_X9_62_prime256v1 || name == SN_secp384r1 || name == SN_secp521r1;
}

bool hasKeyWithinBounds(X509* certificate) {
    EVP_PKEY* key = X509_get0_pubkey(certificate);
    if (key == nullptr) return false;
    switch (EVP_PKEY_get_base_id(key)) {
        case EVP_PKEY_RSA:
            return EVP_PKEY_get_bits(key) >= kFewestRsaBits && EVP_PKEY_get_bits(key) <= kMostRsaBits;
        case EVP_PKEY_EC:
            return hasKnownCurve(key);
        default:
            return EVP_PKEY_get_base_id(key) == EVP_PKEY_ED25519 ||
                   EVP_PKEY_get_base_id(key) == EVP_PKEY_ED448;
    }
}

bool isWithinBounds(X509* certificate) {
    const base::Data der = crypto::encodedBy<X509>(i2d_X509, certificate);
    return !der.empty() && der.size() <= kMaximumCertificateSize && trust::der::isNestedDefinite(der) &&
           hasKeyWithinBounds(certificate);
}

bool namesItsPurpose(X509* certificate) {
    return (X509_get_extension_flags(certificate) & EXFLAG_XKUSAGE) != 0 &&
           (X509_get_extended_key_usage(certificate) & XKU_SSL_CLIENT) != 0;
}

/// `nullopt` unless there is exactly one, and it is a valid name of a client.
std::optional<std::string> commonNameOf(X509* certificate) {
    const X509_NAME* subject = X509_get_subject_name(certificate);
    const int place = X509_NAME_get_index_by_NID(subject, NID_commonName, -1);
    if (place < 0 || X509_NAME_get_index_by_NID(subject, NID_commonName, place) >= 0) return std::nullopt;
    const ASN1_STRING* text = X509_NAME_ENTRY_get_data(X509_NAME_get_entry(subject, place));
    unsigned char* bytes = nullptr;
    const int length = ASN1_STRING_to_UTF8(&bytes, text);
    if (length < 0) return std::nullopt;
    const std::unique_ptr<unsigned char, OpenSSLFree> owner(bytes);
    std::string name(reinterpret_cast<const char*>(bytes), static_cast<std::size_t>(length));
    if (!canNameAClient(name)) return std::nullopt;
    return name;
}

std::optional<values::Date> endOf(X509* certificate) {
    std::tm parts{};
    if (ASN1_TIME_to_tm(X509_get0_notAfter(certificate), &parts) != 1) return std::nullopt;
    return values::Date{static_cast<std::int64_t>(::timegm(&parts))};
}

int refuse(X509_STORE_CTX* context, int error) {
    X509_STORE_CTX_set_error(context, error);
    return 0;
}

/// The library has parsed the certificates and checked nothing yet.
int judge(X509_STORE_CTX* context, void*) {
    X509* const shown = X509_STORE_CTX_get0_cert(context);
    STACK_OF(X509)* const sent = X509_STORE_CTX_get0_untrusted(context);
    const int count = sent != nullptr ? sk_X509_num(sent) : 0;
    if (shown == nullptr || static_cast<std::size_t>(count) > kMaximumCertificates || !isWithinBounds(shown))
        return refuse(context, X509_V_ERR_CERT_REJECTED);
    for (int i = 0; i < count; ++i) {
        if (!isWithinBounds(sk_X509_value(sent, i))) return refuse(context, X509_V_ERR_CERT_REJECTED);
    }
    if (X509_verify_cert(context) != 1) return 0;
    if (!namesItsPurpose(shown)) return refuse(context, X509_V_ERR_INVALID_PURPOSE);
    if (!commonNameOf(shown)) return refuse(context, X509_V_ERR_SUBJECT_ISSUER_MISMATCH);
    return 1;
}

}  // namespace

bool canNameAClient(std::string_view name) {
    if (name.empty() || name.size() > kMaximumClientName) return false;
    while (!name.empty()) {
        const std::size_t size = base::utf8SequenceLength(name);
        if (size == 0 || base::isControlCharacter(name.substr(0, size))) return false;
        name.remove_prefix(size);
    }
    return true;
}

std::optional<Client> clientOf(SSL* connection) {
    X509* const shown = SSL_get0_peer_certificate(connection);
    if (shown == nullptr) return std::nullopt;
    std::optional<std::string> name = commonNameOf(shown);
    const std::optional<values::Date> end = endOf(shown);
    if (!name || !end) return std::nullopt;
    return Client{*std::move(name), *end};
}

namespace {

/// Makes the context require from each client a certificate of one of the authorities in the file. Sessions
/// are not resumed: each connection is judged again. Throws Failure: EX_NOINPUT if the file cannot be read,
/// EX_CONFIG if it has no certificate, or one that is not an authority's.
void askForClients(SSL_CTX* context, const std::string& authoritiesFile) {
    const StoreHandle store(X509_STORE_new());
    require(store != nullptr, "set up TLS");
    for (const CertificateHandle& authority : readCertificateFiles(authoritiesFile, kMaximumAuthorities)) {
        if (X509_check_ca(authority.get()) != 1 || !isWithinBounds(authority.get())) {
            throw Failure(EX_CONFIG, format("%@ has a certificate that is not an authority's: %@",
                                            authoritiesFile, nameOf(authority.get())));
        }
        require(X509_STORE_add_cert(store.get(), authority.get()) == 1 &&
                    SSL_CTX_add_client_CA(context, authority.get()) == 1,
                "use the certificates in " + authoritiesFile);
    }
    // An intermediate authority in the file is trusted without its issuer.
    require(X509_STORE_set_flags(store.get(), X509_V_FLAG_PARTIAL_CHAIN) == 1 &&
                SSL_CTX_set1_verify_cert_store(context, store.get()) == 1,
            "set up TLS");
    SSL_CTX_set_security_level(context, kSecurityLevel);
    SSL_CTX_set_max_cert_list(context, kMaximumMessageSize);
    SSL_CTX_set_verify(context, SSL_VERIFY_PEER | SSL_VERIFY_FAIL_IF_NO_PEER_CERT, nullptr);
    SSL_CTX_set_verify_depth(context, kMaximumIntermediates);
    SSL_CTX_set_cert_verify_callback(context, judge, nullptr);
    SSL_CTX_set_session_cache_mode(context, SSL_SESS_CACHE_OFF);
    SSL_CTX_set_options(context, SSL_OP_NO_TICKET);
    require(SSL_CTX_set_num_tickets(context, 0) == 1, "set up TLS");
}

/// A pipe would block the reload, and the signals after it, until somebody writes to it.
void requireRegularFile(const std::string& path) {
    struct stat status {};
    if (stat(path.c_str(), &status) == 0 && !S_ISREG(status.st_mode))
        throw Failure(EX_CONFIG, format("%@ is no regular file", path));
}

std::shared_ptr<boost::asio::ssl::context> load(const TlsFiles& files) {
    requireRegularFile(files.certificate);
    requireRegularFile(files.key);
    auto context = std::make_shared<boost::asio::ssl::context>(boost::asio::ssl::context::tls_server);
    SSL_CTX* native = context->native_handle();
    require(SSL_CTX_set_min_proto_version(native, TLS1_2_VERSION) == 1, "set up TLS");
    SSL_CTX_set_options(native, SSL_OP_NO_RENEGOTIATION | SSL_OP_NO_COMPRESSION);
    // An idle connection keeps no record buffers; TlsStream relies on the other flags.
    SSL_CTX_set_mode(native, SSL_MODE_RELEASE_BUFFERS | SSL_MODE_ENABLE_PARTIAL_WRITE |
                                 SSL_MODE_ACCEPT_MOVING_WRITE_BUFFER);
    SSL_CTX_set_read_ahead(native, 1);  // a record in one call of the system
    require(SSL_CTX_use_certificate_chain_file(native, files.certificate.c_str()) == 1,
            "use the certificate in " + files.certificate);
    const KeyHandle key = readKeyFile(files.key, files.passphraseFile);
    require(SSL_CTX_use_PrivateKey(native, key.get()) == 1, "use the key in " + files.key);
    require(SSL_CTX_check_private_key(native) == 1, "use the key in " + files.key);
    if (!files.clientAuthorities.empty()) {
        requireRegularFile(files.clientAuthorities);
        askForClients(native, files.clientAuthorities);
    }
    return context;
}

}  // namespace

TlsContext::TlsContext(TlsFiles files) : files_(std::move(files)), current_(load(files_)) {}

TlsContext::~TlsContext() = default;

std::shared_ptr<boost::asio::ssl::context> TlsContext::current() const {
    const std::lock_guard lock(mutex_);
    return current_;
}

void TlsContext::reload(const TlsFiles& files) {
    auto loaded = load(files);
    const std::lock_guard lock(mutex_);
    current_ = std::move(loaded);
}

}  // namespace pinwell::lumora
