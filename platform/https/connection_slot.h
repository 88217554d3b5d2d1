// Where a connection waits for the next exchange.
//
// A slot holds one connection at most, to one host and port. Each session has a slot of its own, used by its
// worker alone: the transfer library's handles are not for two threads at once, and its own way to share
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

    /// The handle (a CURLM) for exchanges with this target. What is held for another one is dropped, and so
    /// is a connection on which something has come that nobody asked for. Null if none can be made.
    void* handleFor(const Target& target);

    /// A connection is being made: its TLS context. False if it cannot be made strict.
    bool prepare(void* tlsContext, ServerTrust::Judge judge) noexcept;

    /// What is known of the connection that was prepared last; null if none was.
    const ServerTrust* trust() const noexcept { return trust_.get(); }

    /// A request is about to be sent from this port. Returns false if that is not the connection that was
    /// judged.
    bool confirm(int localPort) noexcept;

    /// The exchange is over: keeps its connection, whose socket is this one.
    void keep(int socket) noexcept;

    /// Closes what is held.
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
    int localPort_ = 0;  // of the connection; 0: not known yet
    int socket_ = -1;    // the handle's own
};

}  // namespace pinwell::https
