// A TLS server on the loopback address that does exactly the steps of its script, valid or not.
//
//   HostileServer server(identityOf(ServerChain("localhost").issue()));
//   server.enqueue(Script().respond({.status = 200, .body = "hello"}));      // the first connection
//   server.enqueue(Script().readRequest().send("HTTP/1.1 200 OK\r\n").reset());  // the second one
//   ... fetch server.url("/path") twice ...
//   EXPECT_EQ(server.requests().at(0).method, "POST");
//
// Each connection takes the next queued script. If none is left, the handler responds to every request (404
// without `setHandler`). So a test of an ordinary server needs only:
//
//   server.setHandler([](const RecordedRequest& request) { return Response{.body = request.body}; });
//
// A script is a list of steps, done in order on that connection's own thread. The TLS handshake is at
// `handshake()`, or before the first step that needs it; steps before it use the bare connection. After the
// last step the connection is closed in order. If a step fails, because the peer has gone or the server ends,
// the connection is closed and the rest of its script is dropped.
//
// A stall is an event, not a time: a script waits at a Gate until the test opens it (or the server ends). The
// test can wait until the script has reached the gate.
//
// Bounds: a request of at most 80 MiB, an endless step of at most 256 MiB, 60 seconds of silence from the
// peer, 256 connections. All functions may be called from any thread. The destructor breaks all connections
// and joins all threads. Failures to set up throw std::runtime_error.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace pinwell::test {

struct IssuedChain;

/// The identity of the server, in PEM: the certificates, leaf first, and the leaf's private key.
struct ServerIdentity {
    std::string certificateChain;
    std::string privateKey;
};
ServerIdentity identityOf(const IssuedChain& chain);

/// A script stops at a gate until the test opens it. Copies are the same gate.
class Gate {
  public:
    Gate();

    /// Opens the gate for all waiting scripts, now and later.
    void open() const;

    /// Waits until a script has stopped here; false when that does not happen within a minute.
    [[nodiscard]] bool waitUntilReached() const;

    struct State;

  private:
    friend class ScriptRun;
    std::shared_ptr<State> state_;
};

using HeaderList = std::vector<std::pair<std::string, std::string>>;

/// A received request. The body is as long as Content-Length says; chunked requests are not understood.
struct RecordedRequest {
    std::string method;
    std::string target;   // as sent: "/path?query", or "host:port" of a CONNECT
    std::string version;  // "HTTP/1.1"
    HeaderList headers;
    std::string body;

    /// The first field of that name, compared without regard to case.
    std::optional<std::string> header(std::string_view name) const;
};

/// A well-formed response. Content-Length (of the body) and "Connection: close" are added unless `headers`
/// has fields of these names.
struct Response {
    int status = 200;
    HeaderList headers = {};
    std::string body = {};
    std::string version = "HTTP/1.1";

    std::string bytes() const;
};

/// The steps of a connection.
class Script {
  public:
    // On the bare connection, before the handshake.
    Script& sendPlain(std::string bytes);  // sent instead of TLS
    /// Reads up to the end of a request's head, like a proxy; the request is recorded without a body.
    Script& readPlainHead();
    /// Acts as a proxy that lets the client through: reads its CONNECT and agrees. The client then talks to
    /// this server, whatever host it requested.
    Script& acceptTunnel();

    Script& handshake();
    /// Responds to the client's hello with the server's whole part of a handshake, except its last byte. No
    /// step that needs the handshake may follow.
    Script& partOfHandshake();

    /// Reads one request, head and body, and records it. Does not respond to "Expect: 100-continue".
    Script& readRequest();
    /// Reads up to the end of the request's head only; the request is recorded without a body.
    Script& readHead();
    /// Reads up to the end of these bytes, 1 MiB at most, for input other than HTTP/1.
    Script& readUntil(std::string bytes);

    /// Sends the bytes, as one TLS record if they fit.
    Script& send(std::string bytes);
    /// Sends the bytes one by one, each in its own TLS record.
    Script& drip(std::string bytes);
    /// Sends the bytes again and again until the peer goes away, 256 MiB at most.
    Script& sendEndlessly(std::string bytes);
    /// readRequest(), then the response.
    Script& respond(Response response);

    /// Stops here until the gate is opened.
    Script& waitFor(Gate gate);
    /// Reads and drops all input until the peer closes.
    Script& drain();

    /// Ends: TLS close_notify, then the connection (without a handshake: the connection).
    Script& close();
    /// Ends without close_notify, like a cut connection.
    Script& cut();
    /// Ends with a TCP reset.
    Script& reset();

    struct Step;

  private:
    friend class ScriptRun;
    Script& add(Step step);
    std::vector<std::shared_ptr<const Step>> steps_;
};

/// TLS versions as on the wire.
enum class TLSVersion : std::uint16_t { tls10 = 0x0301, tls11 = 0x0302, tls12 = 0x0303, tls13 = 0x0304 };

struct HostileServerOptions {
    TLSVersion minimum = TLSVersion::tls12;
    TLSVersion maximum = TLSVersion::tls13;
    bool requestsClientCertificate = false;  // requests one; requires none
    /// In PEM: requires a certificate of this authority, and ends the handshake without one.
    std::string clientAuthority = {};
    /// Chosen in the handshake even if the client did not offer it; empty: no ALPN response.
    std::string applicationProtocol = "http/1.1";
    bool offersSessionTickets = true;
    std::string address = "127.0.0.1";  // or "::1"
};

/// The properties of a connection after its handshake, completed or failed.
struct RecordedConnection {
    bool handshakeDone = false;
    std::string serverName;                     // SNI; empty when none was sent
    std::vector<std::string> offeredProtocols;  // ALPN
    std::string version;                        // "TLSv1.3"
    bool sessionReused = false;
    bool presentedClientCertificate = false;
    std::string clientName;  // the common name in it
    bool ended = false;
};

class HostileServer {
  public:
    explicit HostileServer(const ServerIdentity& identity, HostileServerOptions options = {});
    ~HostileServer();
    HostileServer(const HostileServer&) = delete;
    HostileServer& operator=(const HostileServer&) = delete;

    std::uint16_t port() const noexcept;

    /// "https://HOST:PORT" and the path; HOST is the address unless another name is given.
    std::string url(std::string_view path = "/", std::string_view host = {}) const;

    void enqueue(Script script);

    /// Sets the handler for connections without a script. It runs on their threads, one at a time.
    void setHandler(std::function<Response(const RecordedRequest&)> handler);

    std::vector<RecordedRequest> requests() const;
    std::vector<RecordedConnection> connections() const;

    /// Waits until that many requests were recorded, or connections have ended; false when that does not
    /// happen within a minute.
    [[nodiscard]] bool waitForRequests(std::size_t count) const;
    [[nodiscard]] bool waitForEndedConnections(std::size_t count) const;

    struct Impl;

  private:
    std::unique_ptr<Impl> impl_;
};

}  // namespace pinwell::test
