#include "connection.h"

#include <array>
#include <boost/asio/buffer.hpp>
#include <boost/asio/post.hpp>
#include <boost/asio/write.hpp>
#include <boost/beast/http/error.hpp>
#include <boost/beast/http/read.hpp>
#include <boost/beast/http/write.hpp>
#include <chrono>
#include <exception>

#include "runtime/process.h"
#include "values/date.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

namespace asio = boost::asio;
namespace beast = boost::beast;
namespace http = boost::beast::http;
using std::chrono::milliseconds;
using values::format;
using Tcp = asio::ip::tcp;

constexpr const char* kRequestIdentifierHeader = "X-Ostrel-Request-UUID";
constexpr std::string_view kContinue = "HTTP/1.1 100 Continue\r\n\r\n";

// The allowance for the framing of a chunked body.
constexpr std::size_t kFramingAllowance = 256 * 1024;

// How long a closing connection is still read. An immediate close would make the kernel reset the connection
// and discard the unread response.
constexpr milliseconds kFarewellTime{5'000};
constexpr milliseconds kFarewellTimeWhenStopping{
    500};  // a service that is to end does not wait for idle clients
constexpr std::size_t kFarewellBytes = 4 * 1024 * 1024;

constexpr std::size_t kReadSize = 16 * 1024;
constexpr std::size_t kFirstReadSize = 1024;  // for an idle connection's first bytes

std::string addressOf(const Tcp::endpoint& endpoint) {
    boost::system::error_code ignored;
    return endpoint.address().to_string(ignored);
}

std::string describe(const Tcp::endpoint& endpoint) {
    return toString(Endpoint{addressOf(endpoint), endpoint.port()});
}

/// The head of a response; the caller adds the body.
template <class Body>
void setHead(http::response<Body>& message, const Answer& answer, unsigned version, bool close) {
    message.version(version);
    message.result(static_cast<unsigned>(answer.status));
    message.set(http::field::content_type, answer.contentType);
    for (const auto& [name, value] : answer.headers) message.set(name, value);
    message.keep_alive(!close);
}

}  // namespace

Connection::Connection(ConnectionContext& context, Tcp::socket socket, std::shared_ptr<void> place)
    : context_(context),
      place_(std::move(place)),
      plain_(std::move(socket)),
      timer_(plain_->get_executor()),
      buffer_(context.limits.headBytes + kReadSize) {}

Connection::~Connection() {
    if (identifier_ == 0) return;
    context_.table.leave(identifier_);
    if (!established_) context_.counts.handshakeFailed();
    context_.counts.connectionClosed();
}

Tcp::socket& Connection::socket() {
    return stream_ ? stream_->next_layer().next_layer() : *plain_;
}

void Connection::start() {
    ErrorCode error;
    const Tcp::endpoint peer = plain_->remote_endpoint(error);
    if (error) return;
    plain_->set_option(Tcp::no_delay(true), error);
    peer_ = describe(peer);
    identifier_ = context_.table.enter(addressOf(peer), [weak = weak_from_this()] {
        if (const auto self = weak.lock()) {
            asio::post(self->socket().get_executor(), [self] { self->makeRoom(); });
        }
    });
    if (identifier_ == 0) return context_.counts.connectionRefused();
    context_.counts.connectionAccepted();
    if (context_.stopping) return;
    limitTime(context_.limits.handshakeTime);
    plain_->async_wait(Tcp::socket::wait_read, [self = shared_from_this()](ErrorCode failure) {
        if (!failure && self->phase_ != Phase::closing) self->handshake();
    });
}

void Connection::handshake() {
    tls_ = context_.tls.current();
    stream_.emplace(*std::exchange(plain_, std::nullopt), *tls_);
    stream_->next_layer().async_handshake([self = shared_from_this()](ErrorCode failure, std::size_t) {
        if (failure) self->logFailedHandshake(failure);
        if (failure || self->phase_ == Phase::closing) return self->timer_.cancel(), void();
        self->established_ = true;
        if (self->context_.tls.asksForClients()) {
            self->client_ = clientOf(self->stream_->next_layer().native_handle());
            if (!self->client_) return self->close(false);
        }
        self->awaitRequest();
    });
}

/// Only where clients have names: otherwise a client without one would go unnoticed.
void Connection::logFailedHandshake(ErrorCode error) const {
    if (!context_.tls.asksForClients() || phase_ == Phase::closing ||
        error.category() != asio::error::get_ssl_category())
        return;
    context_.errorLog(format("%@: no connection: %s", peer_, error.message()));
}

/// A client must reconnect if its certificate has expired since the handshake, or if a reload has replaced
/// the authorities that it was judged by.
bool Connection::mayGoOn() const {
    if (!client_) return true;
    return values::Date::now() <= client_->validUntil && tls_ == context_.tls.current();
}

void Connection::awaitRequest() {
    phase_ = Phase::silent;
    context_.table.becomeSilent(identifier_);
    if (buffer_.size() > 0) return beginRequest();
    if (context_.stopping) return close(false);
    limitTime(context_.limits.idleTime);
    stream_->async_read_some(buffer_.prepare(kFirstReadSize),
                             [self = shared_from_this()](ErrorCode failure, std::size_t count) {
                                 if (self->phase_ == Phase::closing) return;
                                 if (failure) return self->close(false);
                                 self->buffer_.commit(count);
                                 self->beginRequest();
                             });
}

void Connection::beginRequest() {
    if (!mayGoOn()) return close(false);
    phase_ = Phase::reading;
    context_.table.becomeWaiting(identifier_);
    ++served_;
    begun_ = std::chrono::steady_clock::now();
    received_ = 0;
    headSeen_ = timedOut_ = unread_ = false;
    closeAfterwards_ = served_ >= context_.limits.requestsPerConnection || context_.stopping;
    parser_.emplace();
    parser_->header_limit(static_cast<std::uint32_t>(context_.limits.headBytes));
    parser_->body_limit(kMaximumBodySize);
    limitTime(context_.limits.requestTime);
    readMore();
}

void Connection::readMore() {
    http::async_read_some(
        *stream_, buffer_, *parser_,
        [self = shared_from_this()](ErrorCode error, std::size_t count) { self->onRead(error, count); });
}

void Connection::onRead(ErrorCode error, std::size_t count) {
    if (phase_ == Phase::closing) return;
    received_ += count;
    if (error) return refuseUnreadable(error);
    if (!parser_->is_header_done()) {
        if (received_ > context_.limits.headBytes) return refuse(431, true);
        return readMore();
    }
    if (!headSeen_) {
        headSeen_ = true;
        return onHead();
    }
    if (parser_->is_done()) return onBody();
    if (received_ > context_.limits.headBytes + kMaximumBodySize + kFramingAllowance) {
        return refuse(413, true);
    }
    readMore();
}

void Connection::refuseUnreadable(ErrorCode error) {
    if (timedOut_) return refuse(408, true);
    const bool headDone = parser_->is_header_done();
    if (error == http::error::header_limit || (error == http::error::buffer_overflow && !headDone)) {
        return refuse(431, true);
    }
    if (error == http::error::body_limit || error == http::error::buffer_overflow) {
        return refuse(413, true);
    }
    if (error.category() == make_error_code(http::error::end_of_stream).category() &&
        error != http::error::end_of_stream && error != http::error::partial_message) {
        return refuse(400, true);
    }
    close(false);  // the peer has gone
}

template <class Work>
std::optional<Answer> Connection::guarded(Work&& work) {
    try {
        return work();
    } catch (const std::exception& error) {
        context_.errorLog(format("cannot answer a request: %s", error.what()));
        context_.counts.storeFailed();
        return context_.service.refuseForNow("The records cannot be read at the moment");
    }
}

RequestHead Connection::headOfRequest() const {
    RequestHead head = headOf(parser_->get());
    if (client_) head.client = client_->name;
    return head;
}

void Connection::refuse(int status, bool bodyLeftBehind) {
    if (!headSeen_) return respond(context_.service.refuse(status, nullptr), bodyLeftBehind);
    const RequestHead head = headOfRequest();
    respond(context_.service.refuse(status, &head), bodyLeftBehind);
}

void Connection::onHead() {
    const HttpRequest& request = parser_->get();
    if (!request.keep_alive()) closeAfterwards_ = true;
    if (const auto status = refuseHead(request)) return refuse(*status, announcesBody(request));
    context_.table.becomeBusy(identifier_);
    const std::optional<Answer> answer =
        guarded([&] { return context_.service.answerHead(headOfRequest()); });
    if (answer) return respond(*answer, announcesBody(request));
    if (const auto status = refuseMissingLength(request)) return refuse(*status, announcesBody(request));
    if (parser_->is_done()) return onBody();
    context_.table.becomeWaiting(identifier_);
    if (expectsContinue(request)) return continueThenRead();
    readMore();
}

void Connection::continueThenRead() {
    asio::async_write(*stream_, asio::buffer(kContinue.data(), kContinue.size()),
                      [self = shared_from_this()](ErrorCode error, std::size_t) {
                          if (self->phase_ == Phase::closing) return;
                          if (error) return self->close(false);
                          self->readMore();
                      });
}

void Connection::onBody() {
    context_.table.becomeBusy(identifier_);
    const HttpRequest& request = parser_->get();
    respond(
        *guarded([&] { return std::optional(context_.service.answerBody(headOfRequest(), request.body())); }),
        false);
}

void Connection::count(const Answer& answer) const {
    const auto target = headSeen_ ? parser_->get().target() : boost::beast::string_view();
    context_.counts.requestAnswered(
        headSeen_ ? context_.service.kindOf({target.data(), target.size()}) : RequestKind::unreadable,
        answer.status,
        std::chrono::duration_cast<std::chrono::microseconds>(std::chrono::steady_clock::now() - begun_));
    context_.counts.recordsAnswered(answer.recordsFound, answer.records.size() - answer.recordsFound,
                                    answer.recordsFromMemory);
}

void Connection::log(const Answer& answer, std::size_t size, const std::string& identifier) const {
    RequestEntry entry;
    entry.time = values::Date::now();
    entry.peer = peer_;
    if (client_) entry.client = client_->name;
    if (headSeen_) {
        const HttpRequest& request = parser_->get();
        entry.method = {request.method_string().data(), request.method_string().size()};
        entry.target = {request.target().data(), request.target().size()};
    }
    entry.status = answer.status;
    entry.size = size;
    entry.identifier = identifier;
    entry.records = &answer.records;
    entry.duration =
        std::chrono::duration_cast<std::chrono::microseconds>(std::chrono::steady_clock::now() - begun_);
    context_.accessLog(describeRequest(entry, context_.logForm));
}

void Connection::respond(const Answer& answer, bool bodyLeftBehind) {
    phase_ = Phase::writing;
    limitTime(context_.limits.requestTime);
    unread_ = bodyLeftBehind;
    closeAfterwards_ = closeAfterwards_ || bodyLeftBehind || context_.stopping;
    const HttpRequest& request = parser_->get();
    const unsigned version = headSeen_ ? request.version() : 11;
    const std::string identifier = runtime::globallyUniqueString();
    const bool withoutBody = request.method() == http::verb::head;
    const auto done = [self = shared_from_this()](ErrorCode error, std::size_t) { self->onWritten(error); };

    const std::size_t size = answer.asset ? answer.asset->size() : answer.body.size();
    count(answer);
    log(answer, size, identifier);
    if (answer.asset && !withoutBody) {
        asset_ = answer.asset;
        // The library's own cast: a body of characters over the bytes that all downloads share.
        const auto* characters = reinterpret_cast<const char*>(asset_->data());
        assetMessage_.emplace();
        setHead(*assetMessage_, answer, version, closeAfterwards_);
        assetMessage_->set(kRequestIdentifierHeader, identifier);
        assetMessage_->body() = beast::span<const char>(characters, size);
        assetMessage_->content_length(size);
        http::async_write(*stream_, *assetMessage_, done);
        return;
    }
    message_.emplace();
    setHead(*message_, answer, version, closeAfterwards_);
    message_->set(kRequestIdentifierHeader, identifier);
    if (!withoutBody) message_->body() = answer.body;
    message_->content_length(size);
    http::async_write(*stream_, *message_, done);
}

void Connection::onWritten(ErrorCode error) {
    message_.reset();
    assetMessage_.reset();
    asset_.reset();
    if (phase_ == Phase::closing) return;
    if (error) return close(false);
    if (closeAfterwards_) return close(unread_);
    parser_.reset();
    if (buffer_.size() == 0) buffer_.shrink_to_fit();
    awaitRequest();
}

void Connection::close(bool unread) {
    phase_ = Phase::closing;
    context_.table.becomeSilent(identifier_);
    unread_ = unread;
    if (!stream_) {
        timer_.cancel();
        ErrorCode ignored;
        socket().close(ignored);
        return;
    }
    limitTime(context_.stopping ? kFarewellTimeWhenStopping : kFarewellTime);
    stream_->next_layer().async_shutdown([self = shared_from_this()](ErrorCode, std::size_t) {
        ErrorCode ignored;
        if (!self->unread_) {
            self->timer_.cancel();
            self->socket().close(ignored);
            return;
        }
        self->socket().shutdown(Tcp::socket::shutdown_send, ignored);
        self->drain(0);
    });
}

void Connection::drain(std::size_t drained) {
    buffer_.clear();
    socket().async_read_some(buffer_.prepare(kReadSize),
                             [self = shared_from_this(), drained](ErrorCode error, std::size_t count) {
                                 if (!error && drained + count < kFarewellBytes)
                                     return self->drain(drained + count);
                                 self->timer_.cancel();
                                 ErrorCode ignored;
                                 self->socket().close(ignored);
                             });
}

void Connection::limitTime(milliseconds time) {
    deadline_ = std::chrono::steady_clock::now() + time;
    if (!timerIsSet_ || deadline_ < timer_.expiry()) setTimer();
}

void Connection::setTimer() {
    timer_.expires_at(deadline_);
    timerIsSet_ = true;
    timer_.async_wait([self = shared_from_this()](ErrorCode error) {
        // Cancelled, or set again before this ran.
        if (error || self->timer_.expiry() > std::chrono::steady_clock::now()) return;
        self->timerIsSet_ = false;
        if (self->deadline_ <= std::chrono::steady_clock::now()) return self->onTimeout();
        self->setTimer();
    });
}

void Connection::onTimeout() {
    ErrorCode ignored;
    if (phase_ == Phase::reading) {
        timedOut_ = true;
        socket().cancel(ignored);  // the read ends, and the refusal is sent
    } else if (phase_ == Phase::silent && established_) {
        socket().cancel(ignored);  // the read ends, and the connection is closed in good form
    } else {
        phase_ = Phase::closing;
        socket().close(ignored);
    }
}

void Connection::makeRoom() {
    // At the end of the service, a request that has begun is finished.
    if (phase_ != Phase::silent && (phase_ != Phase::reading || context_.stopping)) return;
    ErrorCode ignored;
    if (phase_ == Phase::silent && established_) {
        socket().cancel(ignored);  // the read ends, and the connection is closed in good form
        return;
    }
    phase_ = Phase::closing;
    timer_.cancel();
    socket().close(ignored);
}

}  // namespace pinwell::lumora
