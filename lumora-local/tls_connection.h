// One accepted TLS connection under a watch: no request may take longer, or bring more bytes, than it is
// given.
#pragma once

#include <sys/types.h>

#include <chrono>
#include <cstddef>
#include <memory>
#include <string>

#include "foundation/file_io.h"

struct ssl_ctx_st;
struct ssl_st;

namespace pinwell::lumora {

/// Made once and shared by all connections; thread-safe. TLS 1.2 or later. Throws Failure when the
/// certificate or its key cannot be used.
class TlsContext {
  public:
    TlsContext(const std::string& certificatePath, const std::string& keyPath);

    ssl_ctx_st* get() const noexcept { return context_.get(); }

  private:
    std::shared_ptr<ssl_ctx_st> context_;
};

/// What one request may cost.
struct RequestLimits {
    std::chrono::milliseconds time;  // from its first byte until it has been answered
    std::size_t bytes;               // request line and headers, until allowMore
};

/// Which limit, if any, ended the reading of a request.
enum class LimitReached { none, time, bytes };

/// One thread at a time. Reads and writes block until they are done, the time is over, or the peer is gone.
class TlsConnection {
  public:
    /// Takes the connected, non-blocking socket. `stopDescriptor` becomes readable, and stays so, when the
    /// server is to stop.
    TlsConnection(const TlsContext& context, foundation::FileDescriptor socket, int stopDescriptor);
    ~TlsConnection();
    TlsConnection(const TlsConnection&) = delete;
    TlsConnection& operator=(const TlsConnection&) = delete;

    /// The TLS handshake. False when it fails, takes longer than `time`, or the server is to stop.
    bool accept(std::chrono::milliseconds time);

    /// Waits for the first byte of the next request. False when the peer closes, `time` goes by, or the
    /// server is to stop and nothing has come yet.
    bool awaitRequest(std::chrono::milliseconds time);

    /// From here on reads and writes count against `limits`.
    void beginRequest(const RequestLimits& limits);

    /// The request may bring `bytes` more.
    void allowMore(std::size_t bytes) noexcept { bytesLeft_ += bytes; }

    /// As recv and send: the number of bytes, 0 at the end of the stream, -1 for any failure. A read past the
    /// byte limit fails, as do reads and writes once the time is over.
    ssize_t read(char* buffer, std::size_t size);
    ssize_t write(const char* data, std::size_t size);

    LimitReached limitReached() const noexcept { return limitReached_; }

    /// Says good-bye. With `unread` input on its way, waits a moment for the peer to notice: closing at once
    /// would make the kernel reset the connection and take the answer back that the peer has yet to read.
    void close(bool unread);

    int socket() const noexcept { return socket_.get(); }

  private:
    using Clock = std::chrono::steady_clock;

    /// Runs an operation of the TLS library until it is done; waits for the socket where it asks for that.
    template <class Operation>
    int drive(Operation&& operation, bool endsWithServer);
    bool waitFor(short events, bool endsWithServer);

    foundation::FileDescriptor socket_;
    int stopDescriptor_;
    std::shared_ptr<ssl_st> ssl_;
    Clock::time_point deadline_;
    std::size_t bytesLeft_ = 0;
    LimitReached limitReached_ = LimitReached::none;
    bool broken_ = false;
};

}  // namespace pinwell::lumora
