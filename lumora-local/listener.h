// A listening TCP socket.
#pragma once

#include "foundation/file_io.h"
#include "lumora-local/endpoint.h"

namespace pinwell::lumora {

/// One thread at a time.
class Listener {
  public:
    /// Binds and listens; port 0 lets the system choose one. A name is resolved, and its first usable address
    /// is taken. Throws Failure (EX_UNAVAILABLE), which names the address.
    explicit Listener(const Endpoint& endpoint);

    /// The requested host, with the bound port.
    const Endpoint& endpoint() const noexcept { return endpoint_; }

    /// Non-blocking; the listener keeps it until release().
    int descriptor() const noexcept { return socket_.get(); }

    /// Hands the socket to the caller.
    foundation::FileDescriptor release() noexcept { return std::move(socket_); }

  private:
    Endpoint endpoint_;
    foundation::FileDescriptor socket_;
};

}  // namespace pinwell::lumora
