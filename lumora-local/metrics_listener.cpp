#include <atomic>
#include <boost/asio/io_context.hpp>
#include <boost/asio/ip/tcp.hpp>
#include <boost/asio/steady_timer.hpp>
#include <boost/beast/core/flat_buffer.hpp>
#include <boost/beast/core/tcp_stream.hpp>
#include <boost/beast/http/empty_body.hpp>
#include <boost/beast/http/parser.hpp>
#include <boost/beast/http/read.hpp>
#include <boost/beast/http/string_body.hpp>
#include <boost/beast/http/write.hpp>
#include <exception>
#include <optional>
#include <thread>
#include <utility>

#include "metrics.h"

namespace pinwell::lumora {
namespace {

namespace asio = boost::asio;
namespace beast = boost::beast;
namespace http = boost::beast::http;
using Tcp = asio::ip::tcp;
using ErrorCode = boost::system::error_code;
using MetricsResponse = http::response<http::string_body>;

constexpr std::size_t kMostScrapers = 16;  // at a time
constexpr std::size_t kScrapeHeadBytes = 8 * 1024;
constexpr std::chrono::seconds kScrapeTime{10};
constexpr std::chrono::milliseconds kScrapePause{100};  // after the system had no descriptor for a connection

MetricsResponse metricsResponse(http::status status, std::string body) {
    MetricsResponse response(status, 11);
    response.set(http::field::content_type, "text/plain; charset=utf-8");
    response.body() = std::move(body);
    return response;
}

MetricsResponse answerScrape(const http::request<http::empty_body>& request,
                             const std::function<std::string()>& text) {
    const auto target = request.target();
    if (target.substr(0, target.find('?')) != "/metrics")
        return metricsResponse(http::status::not_found, "The metrics are at /metrics.\n");
    if (request.method() != http::verb::get && request.method() != http::verb::head) {
        MetricsResponse response =
            metricsResponse(http::status::method_not_allowed, "The method here is GET.\n");
        response.set(http::field::allow, "GET, HEAD");
        return response;
    }
    try {
        MetricsResponse response = metricsResponse(http::status::ok, text());
        response.set(http::field::content_type, {kMetricsContentType.data(), kMetricsContentType.size()});
        return response;
    } catch (const std::exception&) {
        return metricsResponse(http::status::internal_server_error, "The metrics cannot be had.\n");
    }
}

/// One request and its response.
class Scrape : public std::enable_shared_from_this<Scrape> {
  public:
    Scrape(Tcp::socket socket, const std::function<std::string()>& text, std::shared_ptr<void> place)
        : stream_(std::move(socket)), text_(text), place_(std::move(place)) {}

    void start() {
        parser_.header_limit(kScrapeHeadBytes);
        parser_.body_limit(0);
        stream_.expires_after(kScrapeTime);
        http::async_read_header(stream_, buffer_, parser_,
                                [self = shared_from_this()](ErrorCode error, std::size_t) {
                                    if (!error) self->answer();
                                });
    }

  private:
    void answer() {
        response_ = answerScrape(parser_.get(), text_);
        response_.keep_alive(false);
        const std::size_t size = response_.body().size();
        if (parser_.get().method() == http::verb::head) response_.body().clear();
        response_.content_length(size);
        stream_.expires_after(kScrapeTime);
        http::async_write(stream_, response_, [self = shared_from_this()](ErrorCode error, std::size_t) {
            if (!error) self->finish();
        });
    }

    /// Waits for the peer's end: an early close would discard the unread response.
    void finish() {
        ErrorCode ignored;
        stream_.socket().shutdown(Tcp::socket::shutdown_send, ignored);
        buffer_.clear();
        stream_.async_read_some(buffer_.prepare(kScrapeHeadBytes),
                                [self = shared_from_this()](ErrorCode, std::size_t) {});
    }

    beast::tcp_stream stream_;
    const std::function<std::string()>& text_;
    std::shared_ptr<void> place_;
    beast::flat_buffer buffer_{2 * kScrapeHeadBytes};
    http::request_parser<http::empty_body> parser_;
    MetricsResponse response_;
};

}  // namespace

class MetricsListener::Loop {
  public:
    Loop(Listener& listener, std::function<std::string()> text)
        : text_(std::move(text)), acceptor_(context_), pause_(context_) {
        acceptor_.assign(listener.isIPv6() ? Tcp::v6() : Tcp::v4(), listener.release().release());
        acceptor_.non_blocking(true);
        accept();
        thread_ = std::thread([this] { run(); });
    }

    ~Loop() {
        ending_ = true;
        context_.stop();
        thread_.join();
    }
    Loop(const Loop&) = delete;
    Loop& operator=(const Loop&) = delete;

  private:
    /// An exception of a handler ends only that handler.
    void run() {
        for (;;) {
            try {
                context_.run();
                return;
            } catch (const std::exception&) {
                continue;
            }
        }
    }

    void accept() {
        if (free_ == 0) {
            waiting_ = true;
            return;
        }
        acceptor_.async_accept([this](ErrorCode error, Tcp::socket socket) {
            if (error) return acceptLater();
            std::make_shared<Scrape>(std::move(socket), text_, takePlace())->start();
            accept();
        });
    }

    void acceptLater() {
        pause_.expires_after(kScrapePause);
        pause_.async_wait([this](ErrorCode error) {
            if (!error) accept();
        });
    }

    /// Returned when the connection ends.
    std::shared_ptr<void> takePlace() {
        --free_;
        return {nullptr, [this](void*) {
                    ++free_;
                    if (!ending_ && std::exchange(waiting_, false)) accept();
                }};
    }

    std::function<std::string()> text_;
    std::size_t free_ = kMostScrapers;
    bool waiting_ = false;
    std::atomic<bool> ending_{false};
    asio::io_context context_{1};
    Tcp::acceptor acceptor_;
    asio::steady_timer pause_;
    std::thread thread_;
};

MetricsListener::MetricsListener(Listener& listener, std::function<std::string()> text)
    : loop_(std::make_unique<Loop>(listener, std::move(text))) {}

MetricsListener::~MetricsListener() = default;

}  // namespace pinwell::lumora
