#include "metrics.h"

#include <prometheus/metric_family.h>
#include <prometheus/text_serializer.h>

#include <utility>

namespace pinwell::lumora {
namespace {

using prometheus::ClientMetric;
using prometheus::MetricFamily;
using prometheus::MetricType;
using Labels = std::vector<ClientMetric::Label>;

constexpr double kMicroseconds = 1e6;  // of a second; dividing by it rounds once

/// Families in the order in which they are made.
class Families {
  public:
    void begin(const char* name, const char* help, MetricType type) {
        families_.push_back({name, help, type, {}});
    }

    void add(double value, Labels labels = {}) {
        ClientMetric metric;
        metric.label = std::move(labels);
        metric.counter.value = metric.gauge.value = value;
        families_.back().metric.push_back(std::move(metric));
    }

    void add(ClientMetric metric) { families_.back().metric.push_back(std::move(metric)); }

    void gauge(const char* name, const char* help, double value) {
        begin(name, help, MetricType::Gauge);
        add(value);
    }

    void counter(const char* name, const char* help, std::uint64_t value) {
        begin(name, help, MetricType::Counter);
        add(static_cast<double>(value));
    }

    std::string text() const { return prometheus::TextSerializer().Serialize(families_); }

  private:
    std::vector<MetricFamily> families_;
};

std::string statusName(std::size_t index) {
    return index == kOtherStatus ? "other" : std::to_string(kCountedStatuses.at(index));
}

/// Of statuses that did not occur, only 200 is there: a rate needs a zero to begin with.
void addRequests(Families& families, const ServiceCounts::Snapshot& counts) {
    families.begin("lumora_requests_total", "Requests that were answered.", MetricType::Counter);
    for (std::size_t kind = 0; kind < kRequestKinds; ++kind) {
        const auto& byStatus = counts.requests[kind].byStatus;
        for (std::size_t index = 0; index < byStatus.size(); ++index) {
            if (byStatus[index] == 0 && index != 0) continue;
            families.add(static_cast<double>(byStatus[index]),
                         {{"path", kRequestKindNames[kind]}, {"status", statusName(index)}});
        }
    }
}

void addDurations(Families& families, const ServiceCounts::Snapshot& counts) {
    families.begin("lumora_request_duration_seconds",
                   "Time from a request's first byte to its answer, without sending it.",
                   MetricType::Histogram);
    for (std::size_t kind = 0; kind < kRequestKinds; ++kind) {
        const auto& requests = counts.requests[kind];
        ClientMetric metric;
        metric.label = {{"path", kRequestKindNames[kind]}};
        std::uint64_t count = 0;
        for (std::size_t index = 0; index < requests.byDuration.size(); ++index) {
            count += requests.byDuration[index];
            if (index == kDurationBounds.size()) break;
            metric.histogram.bucket.push_back(
                {count, static_cast<double>(kDurationBounds[index]) / kMicroseconds});
        }
        metric.histogram.sample_count = count;
        metric.histogram.sample_sum = static_cast<double>(requests.microseconds) / kMicroseconds;
        families.add(std::move(metric));
    }
}

void addRecords(Families& families, const ServiceCounts::Snapshot& counts) {
    families.begin("lumora_looked_up_records_total", "Names in lookups that were answered.",
                   MetricType::Counter);
    families.add(static_cast<double>(counts.recordsKnown), {{"result", "known"}});
    families.add(static_cast<double>(counts.recordsUnknown), {{"result", "unknown"}});
    families.counter("lumora_cached_records_total", "Of the known records, those that were ready in memory.",
                     counts.recordsFromMemory);
}

void addConnections(Families& families, const ServiceCounts::Snapshot& counts) {
    families.counter("lumora_connections_total", "Connections that were accepted.",
                     counts.connectionsAccepted);
    families.gauge("lumora_open_connections", "Connections that are open.",
                   static_cast<double>(counts.connectionsAccepted - counts.connectionsClosed));
    families.counter("lumora_refused_connections_total", "Connections of peers that had too many.",
                     counts.connectionsRefused);
    families.counter("lumora_failed_handshakes_total", "Connections that ended before TLS was set up.",
                     counts.handshakesFailed);
}

void addStore(Families& families, const ServiceCounts::Snapshot& counts, const ServiceFacts& facts) {
    families.counter("lumora_store_failures_total", "Requests that failed because the store did.",
                     counts.storeFailures);
    families.gauge("lumora_store_readable", "1 if the records can be read, or 0.", facts.store ? 1 : 0);
    if (!facts.store) return;
    families.gauge("lumora_records", "Records in the store.", static_cast<double>(facts.store->records));
    families.counter("lumora_events_total", "Events in the log, by whichever program.", facts.store->events);
    if (facts.store->connectionsMade) {
        families.counter("lumora_database_connections_total",
                         "Connections to the database that were made; it grows when they are lost.",
                         *facts.store->connectionsMade);
    }
}

}  // namespace

void requireMetrics() {}

std::string describeMetrics(const ServiceCounts::Snapshot& counts, const ServiceFacts& facts) {
    Families families;
    families.begin("lumora_build_info", "Always 1; the label says what is running.", MetricType::Gauge);
    families.add(1, {{"version", facts.version}});
    families.gauge("lumora_start_time_seconds", "When the service started, in seconds since 1970.",
                   static_cast<double>(facts.started.seconds));
    addRequests(families, counts);
    addDurations(families, counts);
    addRecords(families, counts);
    addConnections(families, counts);
    addStore(families, counts, facts);
    families.begin("lumora_certificate_expiry_timestamp_seconds",
                   "When each certificate expires, in seconds since 1970.", MetricType::Gauge);
    for (const CertificateDate& certificate : facts.certificates)
        families.add(static_cast<double>(certificate.expiry.seconds), {{"certificate", certificate.role}});
    return families.text();
}

}  // namespace pinwell::lumora
