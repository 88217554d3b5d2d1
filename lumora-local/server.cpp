#include "lumora-local/server.h"

#include <httplib.h>
#include <poll.h>

#include <array>
#include <charconv>
#include <condition_variable>
#include <exception>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "foundation/date.h"
#include "foundation/format.h"
#include "foundation/process.h"

namespace pinwell::lumora {
namespace {

using foundation::FileDescriptor;
using foundation::format;
using LogLine = Server::LogLine;

constexpr const char* kRequestIdentifierHeader = "X-Ostrel-Request-UUID";

// Longer request targets are refused before anything looks at them.
constexpr std::size_t kMaximumTargetLength = 2048;

// What a body may bring besides itself when it comes in chunks.
constexpr std::size_t kFramingAllowance = 256 * 1024;

/// The library's view of one of our connections.
class ConnectionStream final : public httplib::Stream {
  public:
    explicit ConnectionStream(TlsConnection& connection) : connection_(connection) {}

    bool is_readable() const override { return true; }  // whether it is, reading finds out, within its limits
    bool is_writable() const override { return true; }
    ssize_t read(char* buffer, size_t size) override { return connection_.read(buffer, size); }
    ssize_t write(const char* data, size_t size) override { return connection_.write(data, size); }
    void get_remote_ip_and_port(std::string& ip, int& port) const override { noAddress(ip, port); }
    void get_local_ip_and_port(std::string& ip, int& port) const override { noAddress(ip, port); }
    socket_t socket() const override { return connection_.socket(); }

  private:
    // The access log has the peer from elsewhere: the library asks for it only once a request could be
    // parsed.
    static void noAddress(std::string& ip, int& port) {
        ip.clear();
        port = 0;
    }

    TlsConnection& connection_;
};

/// One request on its way through the library, whose handlers see nothing but what the client sent. It stays
/// on one thread from its first byte to its answer.
struct Exchange {
    TlsConnection& connection;
    const std::string& peer;
    bool understood = false;      // the head could be parsed
    bool bodyLeftBehind = false;  // and would be taken for the next request
};
thread_local Exchange* currentExchange = nullptr;

RequestHead headOf(const httplib::Request& request) {
    return {request.method, request.target, request.get_header_value("Host"),
            request.get_header_value("Content-Type"), request.get_header_value("Content-Encoding")};
}

void apply(const Answer& answer, httplib::Response& response) {
    response.status = answer.status;
    response.set_content(answer.body, answer.contentType);
    for (const auto& [name, value] : answer.headers) response.set_header(name, value);
}

/// What the HTTP library refuses by itself, in our form.
Answer libraryRefusal(int status) {
    switch (status) {
        case 408:
            return refusal(408, "REQUEST_TIMEOUT", "The request took too long to arrive");
        case 413:
            return refusal(413, "PAYLOAD_TOO_LARGE", "The body is too large");
        case 414:
            return refusal(414, "URI_TOO_LONG", "The request's target is too long");
        case 416:
            return refusal(416, "RANGE_NOT_SATISFIABLE", "The range cannot be served");
        case 431:
            return refusal(431, "HEADERS_TOO_LARGE", "The request's headers are too large");
        case 500:
            return refusal(500, "INTERNAL_ERROR", "The service failed");
        default:
            return refusal(status, "BAD_REQUEST", "The request is malformed");
    }
}

bool announcesBody(const httplib::Request& request) {
    return request.has_header("Transfer-Encoding") ||
           (request.has_header("Content-Length") && request.get_header_value("Content-Length") != "0");
}

/// Nothing when it is absent, doubled or not a number.
std::optional<std::uint64_t> contentLength(const httplib::Request& request) {
    if (request.get_header_value_count("Content-Length") != 1) return std::nullopt;
    const std::string text = request.get_header_value("Content-Length");
    std::uint64_t length = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), length);
    if (error != std::errc{} || end != text.data() + text.size()) return std::nullopt;
    return length;
}

/// A body must have one end that both sides see (RFC 9112, 6.3); the library would go on without.
std::optional<Answer> refuseUnclearLength(const httplib::Request& request) {
    const bool chunked = request.has_header("Transfer-Encoding");
    const bool counted = request.has_header("Content-Length");
    if (!chunked && !counted) return refusal(411, "LENGTH_REQUIRED", "A lookup says how long it is");
    if (chunked ? counted : !contentLength(request)) return libraryRefusal(400);
    return std::nullopt;
}

/// The HTTP library as parser and serialiser. It neither listens nor accepts: its own listening has no bound
/// on the length of a header line or of a whole request, and would let two services share one port.
class HttpEngine final : public httplib::Server {
  public:
    HttpEngine(const LookupService& lookups, const LogLine& accessLog, const LogLine& errorLog,
               const ServerLimits& limits)
        : lookups_(lookups), errorLog_(errorLog) {
        // The library only tells clients about these two; keeping them is up to serveConnection.
        set_keep_alive_max_count(limits.requestsPerConnection);
        set_keep_alive_timeout(std::chrono::duration_cast<std::chrono::seconds>(limits.idleTime).count());
        set_payload_max_length(kMaximumBodySize);
        // Every request is decided here, before the library matches paths against patterns; what is let
        // through is a lookup whose body is to be read.
        set_pre_routing_handler([this](const httplib::Request& request, httplib::Response& response) {
            return answerHead(request, response) ? HandlerResponse::Handled : HandlerResponse::Unhandled;
        });
        Post(".*", [this](const httplib::Request& request, httplib::Response& response,
                          const httplib::ContentReader& reader) { answerBody(request, response, reader); });
        set_expect_100_continue_handler([](const httplib::Request& request, httplib::Response& response) {
            if (contentLength(request).value_or(0) <= kMaximumBodySize) return 100;
            apply(libraryRefusal(413), response);
            leaveBodyBehind(response);
            return 413;
        });
        set_error_handler([](const httplib::Request&, httplib::Response& response) {
            if (!currentExchange->understood) refuseMalformed(response);
            if (response.body.empty()) apply(libraryRefusal(response.status), response);
        });
        set_post_routing_handler([](const httplib::Request&, httplib::Response& response) {
            if (response.get_header_value("Connection") == "close") response.headers.erase("Keep-Alive");
            response.set_header(kRequestIdentifierHeader, foundation::globallyUniqueString());
        });
        set_logger([&accessLog](const httplib::Request& request, const httplib::Response& response) {
            accessLog(format("%@ %s \"%s %s\" %d %zu %s", foundation::Date::now(), currentExchange->peer,
                             request.method, request.target, response.status, response.body.size(),
                             response.get_header_value(kRequestIdentifierHeader)));
        });
    }

    /// Reads one request and answers it. False when the connection is of no further use.
    bool serveRequest(TlsConnection& connection, const std::string& peer, bool lastOne) {
        ConnectionStream stream(connection);
        Exchange exchange{connection, peer};
        currentExchange = &exchange;
        bool close = lastOne;
        bool peerCloses = false;
        const bool answered = process(stream, lastOne, peerCloses, [&](httplib::Request& request) {
            exchange.understood = true;
            connection.allowMore(kMaximumBodySize + kFramingAllowance);
            request.ranges.clear();  // a ticket is served whole
            close = close || request.get_header_value("Connection") == "close";
        });
        currentExchange = nullptr;
        return answered && exchange.understood && !close && !peerCloses && !exchange.bodyLeftBehind;
    }

  private:
    /// Calls the library. Since 0.16 it wants the addresses of both ends, which nothing here reads.
    template <class Setup, class Self = HttpEngine>
    bool process(httplib::Stream& stream, bool lastOne, bool& peerCloses, const Setup& setup) {
        auto& self = static_cast<Self&>(*this);
        if constexpr (requires { self.process_request(stream, lastOne, peerCloses, setup); }) {
            return self.process_request(stream, lastOne, peerCloses, setup);
        } else {
            return self.process_request(stream, "", 0, "", 0, lastOne, peerCloses, setup);
        }
    }

    bool answerHead(const httplib::Request& request, httplib::Response& response) {
        std::optional<Answer> answer;
        if (request.target.size() > kMaximumTargetLength) {
            answer = libraryRefusal(414);
        } else {
            answer = guarded([&] { return lookups_.answerHead(headOf(request)); });
        }
        if (!answer) answer = refuseUnclearLength(request);
        if (!answer) return false;
        apply(*answer, response);
        if (announcesBody(request)) leaveBodyBehind(response);
        return true;
    }

    void answerBody(const httplib::Request& request, httplib::Response& response,
                    const httplib::ContentReader& reader) {
        std::string body;
        bool tooLarge = false;
        const bool complete = reader([&](const char* data, std::size_t size) {
            tooLarge = size > kMaximumBodySize - body.size();
            if (!tooLarge) body.append(data, size);
            return !tooLarge;
        });
        if (complete) {
            apply(*guarded([&] { return std::optional(lookups_.answerLookup(headOf(request), body)); }),
                  response);
            return;
        }
        tooLarge = tooLarge || response.status == 413 ||
                   currentExchange->connection.limitReached() == LimitReached::bytes;
        const bool tooSlow = currentExchange->connection.limitReached() == LimitReached::time;
        apply(tooSlow ? libraryRefusal(408) : libraryRefusal(tooLarge ? 413 : 400), response);
        leaveBodyBehind(response);
    }

    /// The library has one status for every head that it cannot read.
    static void refuseMalformed(httplib::Response& response) {
        switch (currentExchange->connection.limitReached()) {
            case LimitReached::bytes:
                apply(libraryRefusal(431), response);
                break;
            case LimitReached::time:
                apply(libraryRefusal(408), response);
                break;
            case LimitReached::none:
                break;
        }
        leaveBodyBehind(response);
    }

    static void leaveBodyBehind(httplib::Response& response) {
        currentExchange->bodyLeftBehind = true;
        if (!response.has_header("Connection")) response.set_header("Connection", "close");
    }

    template <class Work>
    std::optional<Answer> guarded(Work&& work) {
        try {
            return work();
        } catch (const std::exception& error) {
            errorLog_(format("cannot answer a request: %s", error.what()));
            return refusal(503, "SERVICE_UNAVAILABLE", "The records cannot be read at the moment");
        }
    }

    const LookupService& lookups_;
    const LogLine& errorLog_;
};

/// Counts connections, so that one more waits in the kernel's queue instead of in our memory.
class ConnectionGate {
  public:
    explicit ConnectionGate(std::size_t places) : places_(places) {}

    void enter() {
        std::unique_lock lock(mutex_);
        changed_.wait(lock, [this] { return places_ > 0; });
        --places_;
    }
    void leave() {
        const std::lock_guard lock(mutex_);
        ++places_;
        changed_.notify_one();
    }

  private:
    std::mutex mutex_;
    std::condition_variable changed_;
    std::size_t places_;
};

/// Whether the descriptor is readable now.
bool isSet(int descriptor) {
    pollfd state{descriptor, POLLIN, 0};
    return ::poll(&state, 1, 0) > 0;
}

void serveConnection(HttpEngine& engine, TlsConnection& connection, const ServerLimits& limits,
                     int stopDescriptor) {
    if (!connection.accept(limits.handshakeTime)) return;
    const std::string peer = peerOf(connection.socket());
    bool usable = true;
    for (std::size_t served = 1; usable && connection.awaitRequest(limits.idleTime); ++served) {
        connection.beginRequest({limits.requestTime, limits.headBytes});
        const bool lastOne = served >= limits.requestsPerConnection || isSet(stopDescriptor);
        usable = engine.serveRequest(connection, peer, lastOne);
    }
    connection.close(!usable);
}

}  // namespace

Server::Server(const LookupService& lookups, const TlsContext& context, LogLine accessLog, LogLine errorLog,
               const ServerLimits& limits)
    : lookups_(lookups),
      context_(context),
      accessLog_(std::move(accessLog)),
      errorLog_(std::move(errorLog)),
      limits_(limits) {}

void Server::run(Listener& listener, int stopDescriptor) {
    HttpEngine engine(lookups_, accessLog_, errorLog_, limits_);
    ConnectionGate gate(limits_.connections);
    httplib::ThreadPool workers(limits_.workers);

    std::array<pollfd, 2> awaited{{{listener.descriptor(), POLLIN, 0}, {stopDescriptor, POLLIN, 0}}};
    for (;;) {
        if (::poll(awaited.data(), awaited.size(), -1) < 0) continue;  // interrupted
        if (awaited[1].revents != 0) break;
        auto socket = std::make_shared<FileDescriptor>(listener.accept());
        if (!*socket) continue;
        gate.enter();
        workers.enqueue([this, &engine, &gate, socket, stopDescriptor] {
            try {
                TlsConnection connection(context_, std::move(*socket), stopDescriptor);
                serveConnection(engine, connection, limits_, stopDescriptor);
            } catch (const std::exception& error) {
                errorLog_(format("a connection ended: %s", error.what()));
            }
            gate.leave();
        });
    }
    listener.close();
    workers.shutdown();
}

}  // namespace pinwell::lumora
