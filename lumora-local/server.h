// Serving over HTTPS: connections, worker threads, limits and the access log.
#pragma once

#include <chrono>
#include <functional>
#include <string_view>
#include <vector>

#include "access_log.h"
#include "endpoint.h"
#include "http_service.h"
#include "service_counts.h"
#include "tls_context.h"

namespace pinwell::lumora {

struct ServerLimits {
    std::size_t workers = 0;                  // threads; 0: one for each processor, and at least four
    std::size_t connections = 16 * 1024;      // accepted and not yet closed; more wait in the kernel's queue
    std::size_t connectionsPerAddress = 256;  // beyond it, the peer's oldest silent connection is closed
    std::size_t requestsPerConnection = 1000;
    std::size_t headBytes = 64 * 1024;  // request line and headers, over all of them
    std::chrono::milliseconds handshakeTime{10'000};
    std::chrono::milliseconds idleTime{5'000};
    std::chrono::milliseconds requestTime{30'000};
};

/// An action while serving, whenever a descriptor becomes readable.
struct Watch {
    int descriptor = -1;
    std::function<void()> react;  // reads the descriptor; from any worker, one call at a time
};

class Server {
  public:
    using LogLine = std::function<void(std::string_view)>;

    /// References must outlive the server. `accessLog` gets one line per request, `errorLog` one for each
    /// request that failed through a fault of the service. Both calls come from any worker, several at a
    /// time. `counts`, if present, counts the events.
    Server(const HttpService& service, const TlsContext& context, LogLine accessLog, LogLine errorLog,
           const ServerLimits& limits = {}, LogForm form = LogForm::text, ServiceCounts* counts = nullptr);

    /// Serves until `stopDescriptor` is readable (and must then stay readable). Then it refuses new
    /// connections, lets the running requests finish, closes the silent connections, and returns. Takes the
    /// listener's socket.
    void run(Listener& listener, int stopDescriptor, const std::vector<Watch>& watches = {});

  private:
    const HttpService& service_;
    const TlsContext& context_;
    LogLine accessLog_;
    LogLine errorLog_;
    ServerLimits limits_;
    LogForm form_;
    ServiceCounts ownCounts_;
    ServiceCounts& counts_;
};

}  // namespace pinwell::lumora
