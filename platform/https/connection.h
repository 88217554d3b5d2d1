// The connection of an exchange: where it leads, how its server is judged, and how it is kept for the next
// exchange.
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "https/session.h"

struct Curl_URL;

namespace pinwell::https {

struct AddressDeleter {
    void operator()(Curl_URL* address) const noexcept;
};
using AddressHandle = std::unique_ptr<Curl_URL, AddressDeleter>;

/// The URL of an exchange, for the transfer library.
struct Target {
    AddressHandle address;
    std::string host;  // without brackets
    std::string port;

    std::string text() const { return host + " port " + port; }
};

/// Returns an error of `unsupportedURL` if the URL is not https, names a user, or names a host that the
/// library would read as another host.
Result<Target> targetOf(const values::URL& url);

/// A longer list is refused without judging. Real chains have 2 to 4.
inline constexpr std::size_t kMaximumPeerCertificates = 16;

/// Replaces the TLS library's judgement of a server by ours.
///
/// Installed in the TLS context of one connection. The handshake calls it with the server's certificates.
/// Nothing else decides: no anchors are loaded, and a connection without a call of the judge is not accepted.
/// Sessions are not resumed or renegotiated, because neither would call the judge.
class ServerTrust {
  public:
    /// Whether to go on with a server that sent these certificates (DER, the leaf first). Called on the
    /// thread of the handshake.
    using Judge = std::function<bool(const std::vector<Data>& certificates)>;

    /// Makes one for a new context (an SSL_CTX), which shares it: the object lives at least as long as the
    /// connection. Returns null if the context cannot be made strict enough.
    static std::shared_ptr<ServerTrust> install(void* context, Judge judge) noexcept;

    explicit ServerTrust(Judge judge) : judge_(std::move(judge)) {}
    ServerTrust(const ServerTrust&) = delete;
    ServerTrust& operator=(const ServerTrust&) = delete;

    /// Refuses every server from now on, because the judge no longer exists.
    void forgetJudge() noexcept { judge_ = nullptr; }

    /// Whether the judge was called, and accepted each time.
    bool accepted() const noexcept { return asked_ && !refused_; }

    /// Whether the server has announced the end of its data (close_notify). Without it, the connection was
    /// cut.
    bool sawOrderlyEnd() const noexcept { return sawOrderlyEnd_; }
    void noteOrderlyEnd() noexcept { sawOrderlyEnd_ = true; }

    /// The server's alert about the client's certificate, in the TLS library's words ("unknown CA"). Empty if
    /// it sent none.
    const std::string& objection() const noexcept { return objection_; }
    void noteAlert(int description) noexcept;

    /// Number of bytes in TLS records since the judge was called.
    std::size_t bytesArrived() const noexcept { return bytesArrived_; }
    void noteRecord(std::size_t length) noexcept { bytesArrived_ += length; }

    /// Whether the last handshake agreed on HTTP/2 (ALPN, RFC 7301).
    bool agreedOnHTTP2() const noexcept { return agreedOnHTTP2_; }

    /// Called by the TLS library; the context is an X509_STORE_CTX.
    bool verify(void* storeContext) noexcept;

  private:
    Judge judge_;
    bool asked_ = false;
    bool refused_ = false;
    bool sawOrderlyEnd_ = false;
    bool agreedOnHTTP2_ = false;
    std::string objection_;
    std::size_t bytesArrived_ = 0;
};

/// Keeps a connection for the next exchange.
///
/// A slot holds at most one connection, to one host and port. Each session has its own slot, which only its
/// worker uses: two threads must not use one handle of the transfer library. The library's own sharing of
/// connections between threads is not safe in the releases that we support.
class ConnectionSlot {
  public:
    ConnectionSlot();
    ~ConnectionSlot();
    ConnectionSlot(const ConnectionSlot&) = delete;
    ConnectionSlot& operator=(const ConnectionSlot&) = delete;

    /// The handle (a CURLM) for exchanges with this target. A connection to another target is dropped, and so
    /// is one with unexpected input. Returns null if no handle can be made.
    void* handleFor(const Target& target);

    /// Prepares the TLS context of a new connection. Returns false if it cannot be made strict.
    bool prepare(void* tlsContext, ServerTrust::Judge judge) noexcept;

    /// The state of the connection prepared last; null if there is none.
    const ServerTrust* trust() const noexcept { return trust_.get(); }

    /// Call it before a request is sent from this port. Returns false if that is not the judged
    /// connection.
    bool confirm(int localPort) noexcept;

    /// Call it after the exchange: keeps its connection, with this socket.
    void keep(int socket) noexcept;

    /// Closes the connection.
    void drop() noexcept;

  private:
    struct HandleDeleter {
        void operator()(void* handle) const noexcept;
    };
    bool isQuiet() const noexcept;

    std::unique_ptr<void, HandleDeleter> handle_;
    std::string host_;
    std::string port_;
    std::shared_ptr<ServerTrust> trust_;
    int localPort_ = 0;  // of the connection; 0: unknown
    int socket_ = -1;    // of the handle
};

}  // namespace pinwell::https
