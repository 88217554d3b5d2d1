// The metrics of a running service, in the text format of Prometheus (version 0.0.4).
//
// docs/service/metrics.md names them all.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/date.h"
#include "lumora-local/certificate_dates.h"
#include "lumora-local/record_store.h"
#include "lumora-local/service_counts.h"

namespace pinwell::lumora {

inline constexpr std::string_view kMetricsContentType = "text/plain; version=0.0.4; charset=utf-8";

/// Facts about a service beside its counts.
struct ServiceFacts {
    std::string version;
    foundation::Date started;
    std::vector<CertificateDate> certificates;
    std::optional<StoreFacts> store;  // `nullopt` if the records cannot be read
};

/// Throws Failure (EX_CONFIG) if this program was built without metrics, before anything is counted.
void requireMetrics();

std::string describeMetrics(const ServiceCounts::Snapshot& counts, const ServiceFacts& facts);

}  // namespace pinwell::lumora
