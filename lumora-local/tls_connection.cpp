#include "lumora-local/tls_connection.h"

#include <openssl/ssl.h>
#include <poll.h>
#include <sys/socket.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <limits>

#include "lumora-local/openssl_handles.h"

namespace pinwell::lumora {
namespace {

using std::chrono::milliseconds;

constexpr milliseconds kFarewellTime{5000};
constexpr std::size_t kFarewellBytes = 4 * 1024 * 1024;

/// Waits at most `time` for one of the descriptors; interruptions by signals do not shorten or lengthen it.
int pollUntil(std::array<pollfd, 2>& descriptors, std::chrono::steady_clock::time_point deadline) {
    for (;;) {
        const auto left = std::chrono::ceil<milliseconds>(deadline - std::chrono::steady_clock::now());
        if (left.count() <= 0) return 0;
        const int ready = ::poll(descriptors.data(), descriptors.size(), static_cast<int>(left.count()));
        if (ready >= 0 || errno != EINTR) return ready;
    }
}

}  // namespace

TlsContext::TlsContext(const std::string& certificatePath, const std::string& keyPath)
    : context_(SSL_CTX_new(TLS_server_method()), SSL_CTX_free) {
    require(context_ != nullptr && SSL_CTX_set_min_proto_version(context_.get(), TLS1_2_VERSION) == 1,
            "set up TLS");
    SSL_CTX_set_options(context_.get(), SSL_OP_NO_RENEGOTIATION | SSL_OP_NO_COMPRESSION);
    SSL_CTX_set_mode(context_.get(), SSL_MODE_ENABLE_PARTIAL_WRITE | SSL_MODE_ACCEPT_MOVING_WRITE_BUFFER);
    require(SSL_CTX_use_certificate_chain_file(context_.get(), certificatePath.c_str()) == 1,
            "use the certificate in " + certificatePath);
    require(SSL_CTX_use_PrivateKey_file(context_.get(), keyPath.c_str(), SSL_FILETYPE_PEM) == 1,
            "use the key in " + keyPath);
}

TlsConnection::TlsConnection(const TlsContext& context, foundation::FileDescriptor socket, int stopDescriptor)
    : socket_(std::move(socket)), stopDescriptor_(stopDescriptor), ssl_(SSL_new(context.get()), SSL_free) {
    broken_ = ssl_ == nullptr || SSL_set_fd(ssl_.get(), socket_.get()) != 1;
}

TlsConnection::~TlsConnection() = default;

bool TlsConnection::waitFor(short events, bool endsWithServer) {
    // A negative descriptor is passed over by poll.
    std::array<pollfd, 2> descriptors{
        {{socket_.get(), events, 0}, {endsWithServer ? stopDescriptor_ : -1, POLLIN, 0}}};
    return pollUntil(descriptors, deadline_) > 0 && descriptors[0].revents != 0;
}

template <class Operation>
int TlsConnection::drive(Operation&& operation, bool endsWithServer) {
    while (!broken_) {
        ERR_clear_error();
        const int result = operation();
        if (result > 0) return result;
        switch (SSL_get_error(ssl_.get(), result)) {
            case SSL_ERROR_WANT_READ:
                if (!waitFor(POLLIN, endsWithServer)) return -1;
                break;
            case SSL_ERROR_WANT_WRITE:
                if (!waitFor(POLLOUT, endsWithServer)) return -1;
                break;
            case SSL_ERROR_ZERO_RETURN:
                return 0;
            default:
                broken_ = true;
                break;
        }
    }
    ERR_clear_error();
    return -1;
}

bool TlsConnection::accept(milliseconds time) {
    deadline_ = Clock::now() + time;
    return drive([this] { return SSL_accept(ssl_.get()); }, true) > 0;
}

bool TlsConnection::awaitRequest(milliseconds time) {
    deadline_ = Clock::now() + time;
    char first = 0;
    return drive([&] { return SSL_peek(ssl_.get(), &first, 1); }, true) > 0;
}

void TlsConnection::beginRequest(const RequestLimits& limits) {
    deadline_ = Clock::now() + limits.time;
    bytesLeft_ = limits.bytes;
    limitReached_ = LimitReached::none;
}

ssize_t TlsConnection::read(char* buffer, std::size_t size) {
    if (size == 0) return 0;
    if (bytesLeft_ == 0) {
        limitReached_ = LimitReached::bytes;
        return -1;
    }
    const auto wanted = static_cast<int>(
        std::min({size, bytesLeft_, static_cast<std::size_t>(std::numeric_limits<int>::max())}));
    const int count = drive([&] { return SSL_read(ssl_.get(), buffer, wanted); }, false);
    if (count > 0) bytesLeft_ -= static_cast<std::size_t>(count);
    if (count < 0 && !broken_) limitReached_ = LimitReached::time;
    return count;
}

ssize_t TlsConnection::write(const char* data, std::size_t size) {
    std::size_t written = 0;
    while (written < size) {
        const auto wanted = static_cast<int>(
            std::min(size - written, static_cast<std::size_t>(std::numeric_limits<int>::max())));
        const int count = drive([&] { return SSL_write(ssl_.get(), data + written, wanted); }, false);
        if (count <= 0) return -1;
        written += static_cast<std::size_t>(count);
    }
    return static_cast<ssize_t>(written);
}

void TlsConnection::close(bool unread) {
    if (broken_) return;
    SSL_shutdown(ssl_.get());
    ERR_clear_error();
    if (!unread || ::shutdown(socket_.get(), SHUT_WR) != 0) return;
    deadline_ = Clock::now() + kFarewellTime;
    std::array<char, 16 * 1024> sink{};
    for (std::size_t drained = 0; drained < kFarewellBytes;) {
        const ssize_t count = ::recv(socket_.get(), sink.data(), sink.size(), 0);
        if (count > 0) {
            drained += static_cast<std::size_t>(count);
        } else if (count == 0 || errno != EAGAIN || !waitFor(POLLIN, false)) {
            return;
        }
    }
}

}  // namespace pinwell::lumora
