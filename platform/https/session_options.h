// What a session holds itself to. The defaults are the product's; tests choose others.
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
        128UL * 1024;                       // of one exchange: interim responses and trailers included
    std::size_t maximumHeaderFields = 256;  // the same

    /// How much the server may send, as it is on the wire, before a line of a head or a piece of a body comes
    /// of it. What the transfer library keeps meanwhile is in proportion.
    std::size_t maximumSilentBytes = 256UL * 1024;

    int maximumRedirects = kMaximumRedirects;

    /// How long nothing may arrive, or be sent. Name lookup, connection and handshake up to the server's
    /// certificate count as one wait.
    std::chrono::milliseconds idleLimit = std::chrono::seconds(kIdleTimeoutSeconds);
    std::chrono::milliseconds pollInterval = std::chrono::seconds(1);  // how often the clock is looked at
    std::function<Clock::time_point()> now = Clock::now;

    /// Keeps the connection of an exchange for the session's next one to the same host and port, which is not
    /// judged again then.
    bool keepsConnection = false;

    /// For how long at most: without an exchange, and in all.
    std::chrono::seconds keepsIdleConnectionFor{60};
    std::chrono::seconds keepsConnectionFor{300};

    /// Shown to every server that the delegate has accepted and that asks for it: whoever sets it should not
    /// follow redirects. Null: none.
    std::shared_ptr<const ClientIdentity> identity = nullptr;

    /// Where downloads are kept; when empty, the user's temporary directory.
    std::function<URL()> temporaryDirectory = {};
};

std::unique_ptr<SessionService> makeSessionService(trust::TrustService& trust, SessionOptions options);

}  // namespace pinwell::https
