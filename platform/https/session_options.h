// The limits of a session. The defaults are the product's; tests choose others.
#pragma once

#include <chrono>
#include <functional>
#include <memory>

#include "https/client_identity.h"
#include "https/session.h"

namespace pinwell::https {

using Clock = std::chrono::steady_clock;

struct SessionOptions {
    std::size_t maximumResponseBody = kMaximumResponseBody;
    std::size_t maximumDownload = kMaximumDownload;
    std::size_t maximumHeaderBytes =
        128UL * 1024;                       // of one exchange, with its interim responses and trailers
    std::size_t maximumHeaderFields = 256;  // the same

    /// How many bytes on the wire the server may send without a complete line of a head or a piece of a body.
    /// The transfer library's memory is in proportion.
    std::size_t maximumSilentBytes = 256UL * 1024;

    int maximumRedirects = kMaximumRedirects;

    /// The longest time without a byte sent or received. Name lookup, connection and handshake up to the
    /// server's certificate count as one wait.
    std::chrono::milliseconds idleLimit = std::chrono::seconds(kIdleTimeoutSeconds);
    std::chrono::milliseconds pollInterval = std::chrono::seconds(1);  // how often the clock is read
    std::function<Clock::time_point()> now = Clock::now;

    /// Keeps the connection of an exchange for the session's next one to the same host and port. The server
    /// is not judged again then.
    bool keepsConnection = false;

    /// The maximum time without an exchange, and in all.
    std::chrono::seconds keepsIdleConnectionFor{60};
    std::chrono::seconds keepsConnectionFor{300};

    /// Sent to every server that the delegate has accepted and that asks for it. So do not follow redirects
    /// with it. Null: none.
    std::shared_ptr<const ClientIdentity> identity = nullptr;

    /// The directory for downloads; if empty, the user's temporary directory.
    std::function<URL()> temporaryDirectory = {};
};

std::unique_ptr<SessionService> makeSessionService(trust::TrustService& trust, SessionOptions options);

}  // namespace pinwell::https
