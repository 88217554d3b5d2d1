// The metrics of a running service, in the text format of Prometheus (version 0.0.4), and GET /metrics over
// plain HTTP. docs/service/metrics.md names them all.
//
// The listener has its own socket and thread. Everybody who reaches the socket may read the metrics: they
// name no client and no record. A connection has one request. Few connections are served at a time, each for
// a few seconds. Others wait in the kernel's queue, and never delay lookups.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "endpoint.h"
#include "record_store.h"
#include "service_counts.h"
#include "values/date.h"

namespace pinwell::lumora {

inline constexpr std::string_view kMetricsContentType = "text/plain; version=0.0.4; charset=utf-8";

struct CertificateDate {
    std::string role;  // server, signer, intermediate or root
    values::Date expiry;
};

/// Facts about a service beside its counts.
struct ServiceFacts {
    std::string version;
    values::Date started;
    std::vector<CertificateDate> certificates;
    std::optional<StoreFacts> store;  // `nullopt` if the records cannot be read
};

/// Throws Failure (EX_CONFIG) if this program was built without metrics, before anything is counted.
void requireMetrics();

std::string describeMetrics(const ServiceCounts::Snapshot& counts, const ServiceFacts& facts);

class MetricsListener {
  public:
    /// Takes the listener's socket. `text` returns the metrics. This class's thread calls it, one call at a
    /// time; it may throw.
    MetricsListener(Listener& listener, std::function<std::string()> text);

    /// Ends the thread, and the connections that are open.
    ~MetricsListener();
    MetricsListener(const MetricsListener&) = delete;
    MetricsListener& operator=(const MetricsListener&) = delete;

  private:
    class Loop;
    std::unique_ptr<Loop> loop_;
};

}  // namespace pinwell::lumora
