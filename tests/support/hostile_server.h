// A TLS server on the loopback address that does exactly what its script says, well-behaved or not.
//
//   HostileServer server(identityOf(ServerChain("localhost").issue()));
//   server.enqueue(Script().respond({.status = 200, .body = "hello"}));      // the first connection
//   server.enqueue(Script().readRequest().send("HTTP/1.1 200 OK\r\n").reset());  // the second one
//   ... fetch server.url("/path") twice ...
//   EXPECT_EQ(server.requests().at(0).method, "POST");
//
// Each connection takes the next script that was enqueued. When none is left, the handler answers every
// request (404 unless `setHandler` was called), so a test that wants an ordinary server writes only:
//
//   server.setHandler([](const RecordedRequest& request) { return Response{.body = request.body}; });
//
// A script is a list of steps, done in order on that connection's own thread. The TLS handshake happens at
// `handshake()`, or before the first step that needs it; what stands before it is on the bare connection.
// When the steps are done the connection is closed in the orderly way. When a step fails, since the peer has
// gone or the server is being destroyed, the connection is closed and what is left of its script is dropped.
//
// Stalling is an event, not a time: a script waits at a Gate until the test opens it (or the server ends),
// and the test can wait until the script has got there.
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

/// What the server shows of itself, in PEM: the certificates leaf first, and the leaf's private key.
struct ServerIdentity {
    std::string certificateChain;
    std::string privateKey;
};
ServerIdentity identityOf(const IssuedChain& chain);

/// Where a script stops until the test lets it go on. Copies are the same gate.
class Gate {
  public:
    Gate();

    /// Lets through whoever waits here, now and later.
    void open() const;

    /// Waits until a script has stopped here; false when that does not happen within a minute.
    [[nodiscard]] bool waitUntilReached() const;

    struct State;

  private:
    friend class ScriptRun;
    std::shared_ptr<State> state_;
};

using HeaderList = std::vector<std::pair<std::string, std::string>>;

/// A request as it came in. The body is as long as Content-Length says; chunked requests are not understood.
struct RecordedRequest {
    std::string method;
    std::string target;   // as sent: "/path?query", or "host:port" of a CONNECT
    std::string version;  // "HTTP/1.1"
    HeaderList headers;
    std::string body;

    /// The first field of that name, compared without regard to case.
    std::optional<std::string> header(std::string_view name) const;
};

/// A well-formed answer. Content-Length (of the body) and "Connection: close" are added unless `headers` has
/// fields of these names.
struct Response {
    int status = 200;
    HeaderList headers = {};
    std::string body = {};
    std::string version = "HTTP/1.1";

    std::string bytes() const;
};

/// What a connection does.
class Script {
  public:
    // On the bare connection, before the handshake.
    Script& sendPlain(std::string bytes);  // what is sent instead of TLS
    /// Reads up to the end of a request's head, as a proxy gets it; the request is recorded without a body.
    Script& readPlainHead();
    /// What a proxy does that lets the client through: reads its CONNECT and agrees. The server that the
    /// client then talks to is this one, whatever host was asked for.
    Script& acceptTunnel();

    Script& handshake();
    /// Answers the client's hello with all that a server has to say in a handshake but its last byte. No step
    /// that needs the handshake may follow.
    Script& partOfHandshake();

    /// Reads one request, head and body, and records it. Answers "Expect: 100-continue" with nothing.
    Script& readRequest();
    /// Reads up to the end of the request's head only; the request is recorded without a body.
    Script& readHead();
    /// Reads up to the end of these bytes, 1 MiB at most, for what is not HTTP/1.
    Script& readUntil(std::string bytes);

    /// Sends the bytes, as one TLS record where they fit.
    Script& send(std::string bytes);
    /// Sends the bytes one by one, each a TLS record of its own.
    Script& drip(std::string bytes);
    /// Sends the bytes again and again until the peer goes away, 256 MiB at most.
    Script& sendEndlessly(std::string bytes);
    /// readRequest(), then the answer.
    Script& respond(Response response);

    /// Stops here until the gate is opened.
    Script& waitFor(Gate gate);
    /// Reads and drops whatever comes until the peer closes.
    Script& drain();

    /// Ends: TLS close_notify, then the connection (without a handshake: the connection).
    Script& close();
    /// Ends without close_notify, as a cut connection looks.
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
    bool requestsClientCertificate = false;  // asks for one; takes none for an answer
    /// In PEM: asks for a certificate that this authority has issued, and ends the handshake without one.
    std::string clientAuthority = {};
    /// Chosen in the handshake even when the client did not offer it; empty: no answer to ALPN.
    std::string applicationProtocol = "http/1.1";
    bool offersSessionTickets = true;
    std::string address = "127.0.0.1";  // or "::1"
};

/// What is known of a connection once its handshake is done, or has failed.
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

    /// Answers the requests of connections for which no script is left. Runs on their threads, one at a time.
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
