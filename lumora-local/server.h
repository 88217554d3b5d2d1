// Serving the protocol over HTTPS: connections, worker threads, limits and the access log.
#pragma once

#include <chrono>
#include <functional>
#include <string_view>

#include "lumora-local/listener.h"
#include "lumora-local/lookup.h"
#include "lumora-local/tls_connection.h"

namespace pinwell::lumora {

struct ServerLimits {
    std::size_t workers = 16;
    std::size_t connections = 256;  // accepted and not yet closed; more wait in the kernel's queue
    std::size_t requestsPerConnection = 1000;
    std::size_t headBytes = 64 * 1024;  // request line and headers, over all of them
    std::chrono::milliseconds handshakeTime{10'000};
    std::chrono::milliseconds idleTime{5'000};
    std::chrono::milliseconds requestTime{30'000};
};

class Server {
  public:
    using LogLine = std::function<void(std::string_view)>;

    /// References must outlive the server. `accessLog` gets one line per request, `errorLog` one for each
    /// request that failed through our own fault; both come from any worker, several at a time.
    Server(const LookupService& lookups, const TlsContext& context, LogLine accessLog, LogLine errorLog,
           const ServerLimits& limits = {});

    /// Serves until `stopDescriptor` is readable (which nobody may undo), then refuses new connections, lets
    /// the requests that have begun finish, closes the idle connections, and returns.
    void run(Listener& listener, int stopDescriptor);

  private:
    const LookupService& lookups_;
    const TlsContext& context_;
    LogLine accessLog_;
    LogLine errorLog_;
    ServerLimits limits_;
};

}  // namespace pinwell::lumora
