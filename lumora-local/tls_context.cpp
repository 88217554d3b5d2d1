#include "lumora-local/tls_context.h"

#include <sys/stat.h>

#include <boost/asio/ssl/context.hpp>

#include "foundation/format.h"
#include "lumora-local/client_certificate.h"
#include "lumora-local/failure.h"
#include "lumora-local/key_file.h"
#include "lumora-local/openssl_handles.h"

namespace pinwell::lumora {
namespace {

/// A pipe would block the reload, and the signals after it, until somebody writes to it.
void requireRegularFile(const std::string& path) {
    struct stat status {};
    if (stat(path.c_str(), &status) == 0 && !S_ISREG(status.st_mode))
        throw Failure(EX_CONFIG, foundation::format("%@ is no regular file", path));
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
