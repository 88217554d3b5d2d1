// A listening TCP socket.
#pragma once

#include <optional>

#include "foundation/file_io.h"
#include "lumora-local/endpoint.h"

namespace pinwell::lumora {

/// One thread at a time.
class Listener {
  public:
    /// Binds and listens; port 0 lets the system choose one. A name is resolved, and the first of its
    /// addresses that can be bound is taken. Throws Failure (EX_UNAVAILABLE), which names the address.
    explicit Listener(const Endpoint& endpoint);

    /// The host as it was asked for, with the port that was bound.
    const Endpoint& endpoint() const noexcept { return endpoint_; }

    /// The next connection. Nothing when there is none after all, or the system cannot serve one right now
    /// (after a short pause, since the cause may be a lack of descriptors).
    foundation::FileDescriptor accept();

    int descriptor() const noexcept { return socket_.get(); }

    /// Refuses further connections.
    void close() noexcept { socket_.reset(); }

  private:
    Endpoint endpoint_;
    foundation::FileDescriptor socket_;
};

/// "ADDRESS:PORT" of the other end, "-" when it cannot be told.
std::string peerOf(int socket);

}  // namespace pinwell::lumora
