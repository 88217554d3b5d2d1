// TLS on a socket of Asio: a stream for Asio and Beast, over OpenSSL's own reading and writing.
//
// Asio's stream keeps 68 KiB of buffers for each connection, idle or not, and copies all bytes through them.
// Here OpenSSL reads and writes the socket, and has buffers only while they have contents
// (SSL_MODE_RELEASE_BUFFERS).
#pragma once

#include <openssl/err.h>
#include <openssl/ssl.h>

#include <boost/asio/compose.hpp>
#include <boost/asio/defer.hpp>
#include <boost/asio/error.hpp>
#include <boost/asio/ip/tcp.hpp>
#include <boost/asio/ssl/context.hpp>
#include <boost/asio/ssl/error.hpp>
#include <cerrno>
#include <optional>
#include <utility>

#include "base/handle.h"

namespace pinwell::lumora {

/// The server's side. One operation to read and one to write at a time, all on the socket's strand; the
/// stream outlives them. An operation on a socket that was closed ends with operation_aborted.
class TlsStream {
  public:
    using next_layer_type = boost::asio::ip::tcp::socket;
    using lowest_layer_type = next_layer_type::lowest_layer_type;
    using executor_type = next_layer_type::executor_type;
    using ErrorCode = boost::system::error_code;

    /// The context may be destroyed before the stream.
    TlsStream(next_layer_type socket, boost::asio::ssl::context& context)
        : socket_(std::move(socket)), ssl_(SSL_new(context.native_handle())) {
        ErrorCode error;
        socket_.non_blocking(true, error);
        if (error || ssl_ == nullptr || SSL_set_fd(ssl_.get(), socket_.native_handle()) != 1)
            throw boost::system::system_error(error ? error : boost::asio::error::no_memory);
        SSL_set_accept_state(ssl_.get());
    }

    executor_type get_executor() { return socket_.get_executor(); }
    next_layer_type& next_layer() { return socket_; }
    const next_layer_type& next_layer() const { return socket_; }
    lowest_layer_type& lowest_layer() { return socket_.lowest_layer(); }
    SSL* native_handle() { return ssl_.get(); }

    /// `handler` gets the error and a meaningless number.
    template <class Handler>
    auto async_handshake(Handler&& handler) {
        return start([](SSL* ssl, std::size_t&) { return SSL_do_handshake(ssl); },
                     std::forward<Handler>(handler));
    }

    template <class Buffers, class Handler>
    auto async_read_some(const Buffers& buffers, Handler&& handler) {
        const boost::asio::mutable_buffer buffer = firstOf<boost::asio::mutable_buffer>(buffers);
        return start(
            [buffer](SSL* ssl, std::size_t& count) {
                if (buffer.size() == 0) return 1;
                return SSL_read_ex(ssl, buffer.data(), buffer.size(), &count);
            },
            std::forward<Handler>(handler));
    }

    template <class Buffers, class Handler>
    auto async_write_some(const Buffers& buffers, Handler&& handler) {
        const boost::asio::const_buffer buffer = firstOf<boost::asio::const_buffer>(buffers);
        return start(
            [buffer](SSL* ssl, std::size_t& count) {
                if (buffer.size() == 0) return 1;
                return SSL_write_ex(ssl, buffer.data(), buffer.size(), &count);
            },
            std::forward<Handler>(handler));
    }

    /// Sends the end of TLS, and waits for the peer's. `handler` as for the handshake.
    template <class Handler>
    auto async_shutdown(Handler&& handler) {
        return start(
            [](SSL* ssl, std::size_t&) {
                const int said = SSL_shutdown(ssl);
                return said == 0 ? SSL_shutdown(ssl) : said;
            },
            std::forward<Handler>(handler));
    }

  private:
    template <class Buffer, class Buffers>
    static Buffer firstOf(const Buffers& buffers) {
        const auto end = boost::asio::buffer_sequence_end(buffers);
        for (auto next = boost::asio::buffer_sequence_begin(buffers); next != end; ++next) {
            const Buffer buffer(*next);
            if (buffer.size() > 0) return buffer;
        }
        return {};
    }

    /// Calls `work`, which returns 1 once it is done, whenever the socket is ready for it.
    template <class Work, class Handler>
    auto start(Work work, Handler&& handler) {
        return boost::asio::async_compose<Handler, void(ErrorCode, std::size_t)>(
            [this, work, began = false, done = std::optional<std::pair<ErrorCode, std::size_t>>()](
                auto& self, ErrorCode error = {}) mutable {
                if (done) return self.complete(done->first, done->second);
                if (!error && !socket_.is_open()) error = boost::asio::error::operation_aborted;
                std::size_t count = 0;
                if (!error) {
                    ERR_clear_error();
                    errno = 0;
                    const int result = work(ssl_.get(), count);
                    const int wanted = result == 1 ? SSL_ERROR_NONE : SSL_get_error(ssl_.get(), result);
                    if (wanted == SSL_ERROR_WANT_READ || wanted == SSL_ERROR_WANT_WRITE) {
                        began = true;
                        const auto readiness = wanted == SSL_ERROR_WANT_READ ? next_layer_type::wait_read
                                                                             : next_layer_type::wait_write;
                        return socket_.async_wait(readiness, std::move(self));
                    }
                    error = errorOf(wanted);
                }
                if (began) return self.complete(error, count);
                // A handler is never called by the function that takes it.
                done.emplace(error, count);
                boost::asio::defer(socket_.get_executor(), std::move(self));
            },
            handler, socket_);
    }

    /// The outcome of OpenSSL's last call on this thread.
    static ErrorCode errorOf(int wanted) {
        if (wanted == SSL_ERROR_NONE) return {};
        if (wanted == SSL_ERROR_ZERO_RETURN) return boost::asio::error::eof;
        const unsigned long code = ERR_get_error();
        ERR_clear_error();
        if (code != 0) return {static_cast<int>(code), boost::asio::error::get_ssl_category()};
        if (wanted == SSL_ERROR_SYSCALL && errno != 0) return {errno, boost::system::system_category()};
        return boost::asio::ssl::error::stream_truncated;
    }

    next_layer_type socket_;
    base::Handle<SSL, SSL_free> ssl_;
};

}  // namespace pinwell::lumora
