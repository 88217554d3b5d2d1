// The certificate and the key that the service shows its clients.
#pragma once

#include <memory>
#include <mutex>
#include <string>

namespace boost::asio::ssl {
class context;
}

namespace pinwell::lumora {

/// PEM files: the certificate chain with the server's certificate first, and its key. If the key is
/// encrypted, the passphrase at `passphraseFile` (key_file.h) opens it. With `clientAuthorities`, a file
/// with their certificates, each client must send a certificate (client_certificate.h).
struct TlsFiles {
    std::string certificate;
    std::string key;
    std::string passphraseFile{};
    std::string clientAuthorities{};
};

/// TLS 1.2 or later, without renegotiation and compression. For any thread.
class TlsContext {
  public:
    /// Throws Failure.
    explicit TlsContext(TlsFiles files);
    ~TlsContext();

    /// The context for new connections. A connection keeps its first context.
    std::shared_ptr<boost::asio::ssl::context> current() const;

    /// Reads these files, or the same ones again. Throws Failure if they cannot be used; current() stays as
    /// it was then.
    void reload(const TlsFiles& files);
    void reload() { reload(files_); }

    /// Whether each client must send a certificate.
    bool asksForClients() const noexcept { return !files_.clientAuthorities.empty(); }

  private:
    TlsFiles files_;
    mutable std::mutex mutex_;
    std::shared_ptr<boost::asio::ssl::context> current_;
};

}  // namespace pinwell::lumora
