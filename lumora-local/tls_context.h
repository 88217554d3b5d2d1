// The certificate and the key that the service shows its clients.
#pragma once

#include <memory>
#include <mutex>
#include <string>

namespace boost::asio::ssl {
class context;
}

namespace pinwell::lumora {

/// TLS 1.2 or later, without renegotiation and compression. May be used from any thread.
class TlsContext {
  public:
    /// PEM files: the certificate chain with the server's certificate first, and its key. Throws Failure.
    TlsContext(std::string certificatePath, std::string keyPath);
    ~TlsContext();

    /// What new connections use. Connections keep the one that they began with.
    std::shared_ptr<boost::asio::ssl::context> current() const;

    /// Reads both files again. Throws Failure if they cannot be used; current() stays as it was then.
    void reload();

  private:
    std::string certificatePath_;
    std::string keyPath_;
    mutable std::mutex mutex_;
    std::shared_ptr<boost::asio::ssl::context> current_;
};

}  // namespace pinwell::lumora
