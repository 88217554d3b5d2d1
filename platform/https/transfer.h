// One HTTPS exchange: a request, and the response of that URL. The caller follows redirects.
//
// A server is judged once for each connection, in the handshake. Each exchange makes a connection, unless the
// session keeps one. Only the proxy comes from the environment (https_proxy, all_proxy, no_proxy); no
// cookies, no credentials, no cache.
#pragma once

#include <sys/eventfd.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <system_error>
#include <vector>

#include "base/handle.h"
#include "body_sink.h"
#include "connection.h"

namespace pinwell::https {

/// A flag that one thread raises, and for which another can wait together with its sockets.
class Interrupt {
  public:
    Interrupt() : event_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
        if (!event_) throw std::system_error(errno, std::generic_category(), "eventfd");
    }

    void raise() noexcept {
        raised_ = true;
        const std::uint64_t one = 1;
        // Fails only if the counter is full; then the descriptor is already readable.
        [[maybe_unused]] const ssize_t ignored = ::write(event_.get(), &one, sizeof one);
    }
    bool isRaised() const noexcept { return raised_; }

    /// Readable after it was raised.
    int descriptor() const noexcept { return event_.get(); }

  private:
    base::FileDescriptor event_;
    std::atomic<bool> raised_ = false;
};

struct TransferContext {
    const SessionOptions& options;
    ConnectionSlot& connection;  // the calling thread's
    const Interrupt& interrupt;  // ends the exchange with `cancelled`
    std::size_t maximumBody;

    /// Judges the server of that host by its certificates, the leaf first; the error is why it is refused.
    std::function<Result<void>(const std::string& host, const std::vector<Data>& certificates)> judge;
};

struct TransferAnswer {
    HTTPResponse response;
    std::optional<std::string> redirectTarget;  // for a redirect: its Location, as an absolute URL
};

/// Blocks until the response is complete or has failed. The body of a redirect is dropped; any other goes to
/// `sink`. A URL that is not https, or that names a user, is refused before anything is sent. The calling
/// thread must have SIGPIPE blocked.
Result<TransferAnswer> transfer(const Request& request, const TransferContext& context, BodySink& sink);

}  // namespace pinwell::https
