// Keeps a connection for the next exchange.
//
// A slot holds at most one connection, to one host and port. Each session has its own slot, which only its
// worker uses: two threads must not use one handle of the transfer library. The library's own sharing of
// connections between threads is not safe in the releases that we support.
#pragma once

#include <memory>

#include "https/server_trust.h"
#include "https/transfer_target.h"

namespace pinwell::https {

class ConnectionSlot {
  public:
    ConnectionSlot();
    ~ConnectionSlot();
    ConnectionSlot(const ConnectionSlot&) = delete;
    ConnectionSlot& operator=(const ConnectionSlot&) = delete;

    /// The handle (a CURLM) for exchanges with this target. A connection to another target is dropped, and so
    /// is one with unexpected input. Returns null if no handle can be made.
    void* handleFor(const Target& target);

    /// Prepares the TLS context of a new connection. Returns false if it cannot be made strict.
    bool prepare(void* tlsContext, ServerTrust::Judge judge) noexcept;

    /// The state of the connection prepared last; null if there is none.
    const ServerTrust* trust() const noexcept { return trust_.get(); }

    /// Call it before a request is sent from this port. Returns false if that is not the judged
    /// connection.
    bool confirm(int localPort) noexcept;

    /// Call it after the exchange: keeps its connection, with this socket.
    void keep(int socket) noexcept;

    /// Closes the connection.
    void drop() noexcept;

  private:
    struct HandleDeleter {
        void operator()(void* handle) const noexcept;
    };
    bool isQuiet() const noexcept;

    std::unique_ptr<void, HandleDeleter> handle_;
    std::string host_;
    std::string port_;
    std::shared_ptr<ServerTrust> trust_;
    int localPort_ = 0;  // of the connection; 0: unknown
    int socket_ = -1;    // of the handle
};

}  // namespace pinwell::https
