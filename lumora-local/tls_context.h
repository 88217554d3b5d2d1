// TLS for clients: the certificate and the key that the service shows them, and the certificates that it
// requires of them.
//
// A client's certificate chains to one of the authorities in a PEM file, is valid now, names the purpose
// clientAuth (RFC 5280, 4.2.1.12), and has one common name: 1 to 64 bytes of UTF-8 without control
// characters. Bounds hold before a signature is checked: 8 certificates, each of at most 16 KiB and without
// indefinite lengths; RSA keys of 2048 to 8192 bits, EC keys on P-256, P-384 and P-521, Ed25519 and Ed448.
// Revocation lists are not read: access.toml takes rights away.
#pragma once

#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "values/date.h"

namespace boost::asio::ssl {
class context;
}

struct ssl_st;

namespace pinwell::lumora {

/// PEM files: the certificate chain with the server's certificate first, and its key. If the key is
/// encrypted, the passphrase at `passphraseFile` (key_file.h) opens it. With `clientAuthorities`, a file
/// with their certificates, each client must send a certificate (above).
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

    /// Reads these files, or the same ones again. Throws Failure if they cannot be used; then current() is
    /// unchanged.
    void reload(const TlsFiles& files);
    void reload() { reload(files_); }

    /// Whether each client must send a certificate.
    bool asksForClients() const noexcept { return !files_.clientAuthorities.empty(); }

  private:
    TlsFiles files_;
    mutable std::mutex mutex_;
    std::shared_ptr<boost::asio::ssl::context> current_;
};

/// RFC 5280, appendix A: ub-common-name.
inline constexpr std::size_t kMaximumClientName = 64;

/// Whether a common name is a valid name of a client.
bool canNameAClient(std::string_view name);

struct Client {
    std::string name;  // common name
    values::Date validUntil;
};

/// The client of a connection after its handshake; `nullopt` if the client has sent no certificate.
std::optional<Client> clientOf(ssl_st* connection);

}  // namespace pinwell::lumora
