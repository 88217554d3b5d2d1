// One HTTPS exchange: a request, and the response of that URL. The caller follows redirects.
//
// A server is judged once for each connection, in the handshake. Each exchange makes a connection, unless the
// session keeps one. Only the proxy comes from the environment (https_proxy, all_proxy, no_proxy); no
// cookies, no credentials, no cache.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "https/body_sink.h"
#include "https/connection_slot.h"
#include "https/interrupt.h"
#include "https/session_options.h"

namespace pinwell::https {

struct TransferContext {
    const SessionOptions& options;
    ConnectionSlot& connection;  // the calling thread's
    const Interrupt& interrupt;  // ends the exchange with `cancelled`
    std::size_t maximumBody;

    /// Judges the server of that host by its certificates, the leaf first: returns `nullopt`, or why it is
    /// refused.
    std::function<std::optional<Error>(const std::string& host, const std::vector<Data>& certificates)> judge;
};

struct TransferAnswer {
    HTTPResponse response;
    std::optional<std::string> redirectTarget;  // for a redirect: its Location, as an absolute URL
};

/// Blocks until the response is complete or has failed. The body of a redirect is dropped; any other goes to
/// `sink`. A URL that is not https, or that names a user, is refused before anything is sent. The calling
/// thread must have SIGPIPE blocked.
foundation::Result<TransferAnswer> transfer(const Request& request, const TransferContext& context,
                                            BodySink& sink);

}  // namespace pinwell::https
