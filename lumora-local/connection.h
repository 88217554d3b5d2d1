// One client's connection: handshake, requests, responses, each within its limits of time and size.
//
// All of it runs on the connection's own strand. A slow client blocks nothing: its connection costs only
// memory, and little before its first byte.
#pragma once

#include <atomic>
#include <boost/asio/ip/tcp.hpp>
#include <boost/asio/steady_timer.hpp>
#include <boost/beast/core/flat_buffer.hpp>
#include <boost/beast/core/flat_stream.hpp>
#include <boost/beast/http/message.hpp>
#include <boost/beast/http/parser.hpp>
#include <boost/beast/http/span_body.hpp>
#include <boost/beast/http/string_body.hpp>
#include <chrono>
#include <memory>
#include <optional>
#include <string>

#include "base/bytes.h"
#include "connection_table.h"
#include "http_service.h"
#include "server.h"
#include "tls_context.h"
#include "tls_stream.h"

namespace pinwell::lumora {

/// The service's rules for requests beyond the parser's checks (http_rules.cpp). Refusals are a status: 400,
/// 408, 411, 413, 414 or 431.
using HttpRequest = boost::beast::http::request<boost::beast::http::string_body>;

/// Whether a body follows the head.
bool announcesBody(const HttpRequest& request);

/// Whether the client waits for an interim response before it sends the body (RFC 9110, 10.1.1).
bool expectsContinue(const HttpRequest& request);

/// Refuses heads before any handler: an unknown method, a target that is too long, framing that two sides may
/// read differently (RFC 9112, 6.3), no host or two hosts.
std::optional<int> refuseHead(const HttpRequest& request);

/// Refuses a request that must have a body and does not state its end.
std::optional<int> refuseMissingLength(const HttpRequest& request);

RequestHead headOf(const HttpRequest& request);

/// The shared state of all connections of a server. Outlives them all.
struct ConnectionContext {
    const HttpService& service;
    const TlsContext& tls;
    const Server::LogLine& accessLog;
    const Server::LogLine& errorLog;
    const ServerLimits& limits;
    LogForm logForm;
    ConnectionTable& table;
    const std::atomic<bool>& stopping;
    ServiceCounts& counts;
};

class Connection : public std::enable_shared_from_this<Connection> {
  public:
    /// Takes an accepted socket whose executor is a strand. `place` is released at the end of the connection.
    Connection(ConnectionContext& context, boost::asio::ip::tcp::socket socket, std::shared_ptr<void> place);
    ~Connection();
    Connection(const Connection&) = delete;
    Connection& operator=(const Connection&) = delete;

    /// Enters the table and waits for the first byte; does nothing if the table has no place. After this call
    /// it keeps itself alive.
    void start();

  private:
    using ErrorCode = boost::system::error_code;
    using Stream = boost::beast::flat_stream<TlsStream>;  // head and body of a response in one record
    using Parser = boost::beast::http::request_parser<boost::beast::http::string_body>;
    using Response = boost::beast::http::response<boost::beast::http::span_body<const char>>;
    using Message = boost::beast::http::response<boost::beast::http::string_body>;

    enum class Phase { silent, reading, writing, closing };

    void handshake();
    void logFailedHandshake(ErrorCode error) const;
    void awaitRequest();
    void beginRequest();
    void readMore();
    void onRead(ErrorCode error, std::size_t count);
    void onHead();
    void continueThenRead();
    void onBody();
    void refuseUnreadable(ErrorCode error);
    void refuse(int status, bool bodyLeftBehind);
    RequestHead headOfRequest() const;
    bool mayGoOn() const;
    void respond(const Answer& answer, bool bodyLeftBehind);
    void count(const Answer& answer) const;
    void log(const Answer& answer, std::size_t size, const std::string& identifier) const;
    void onWritten(ErrorCode error);
    void close(bool unread);
    void drain(std::size_t drained);

    template <class Work>
    std::optional<Answer> guarded(Work&& work);

    /// Limits the time of any wait; a later call replaces the limit. The timer is set again only for an
    /// earlier end, because most limits are replaced long before their end.
    void limitTime(std::chrono::milliseconds time);
    void setTimer();
    void onTimeout();
    /// For another connection of the peer, or at the end of the service. Does nothing during a
    /// response.
    void makeRoom();

    boost::asio::ip::tcp::socket& socket();

    ConnectionContext& context_;
    std::shared_ptr<void> place_;
    std::optional<boost::asio::ip::tcp::socket> plain_;  // until the first byte
    std::shared_ptr<boost::asio::ssl::context> tls_;
    std::optional<Stream> stream_;  // from the first byte on
    boost::asio::steady_timer timer_;
    std::chrono::steady_clock::time_point deadline_;
    bool timerIsSet_ = false;
    std::string peer_;
    std::optional<Client> client_;  // if the server requires certificates
    ConnectionTable::Identifier identifier_ = 0;
    Phase phase_ = Phase::silent;

    boost::beast::flat_buffer buffer_;
    std::optional<Parser> parser_;
    std::optional<Message> message_;
    std::shared_ptr<const base::Data> asset_;
    std::optional<Response> assetMessage_;
    std::chrono::steady_clock::time_point begun_;  // this request
    std::size_t received_ = 0;                     // bytes of this request
    std::size_t served_ = 0;                       // requests of this connection
    bool established_ = false;                     // the handshake is done
    bool headSeen_ = false;
    bool timedOut_ = false;
    bool closeAfterwards_ = false;
    bool unread_ = false;
};

}  // namespace pinwell::lumora
