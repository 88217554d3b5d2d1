// The text for Prometheus, made from counts.
#include "lumora-local/metrics.h"

#include <gtest/gtest.h>

#include <set>

#include "support/process.h"

namespace pinwell::lumora {
namespace {

using pinwell::test::linesOf;
using std::chrono::microseconds;

ServiceFacts sampleFacts() {
    ServiceFacts facts;
    facts.version = "1.2";
    facts.started = values::Date{1'700'000'000};
    facts.certificates = {{"server", values::Date{1'800'000'000}}};
    facts.store = StoreFacts{3, 5, std::nullopt};
    return facts;
}

std::set<std::string> samplesOf(const std::string& text) {
    std::set<std::string> lines;
    for (const std::string& line : linesOf(text)) {
        if (line.starts_with('#')) continue;
        EXPECT_TRUE(lines.insert(line).second) << line << " comes twice";
    }
    return lines;
}

TEST(Metrics, NameTheBuildTheStartTheStoreAndTheCertificates) {
    const auto samples = samplesOf(describeMetrics({}, sampleFacts()));
    EXPECT_TRUE(samples.contains(R"(lumora_build_info{version="1.2"} 1)"));
    EXPECT_TRUE(samples.contains("lumora_start_time_seconds 1700000000"));
    EXPECT_TRUE(samples.contains("lumora_store_readable 1"));
    EXPECT_TRUE(samples.contains("lumora_records 3"));
    EXPECT_TRUE(samples.contains("lumora_events_total 5"));
    EXPECT_TRUE(
        samples.contains(R"(lumora_certificate_expiry_timestamp_seconds{certificate="server"} 1800000000)"));
}

TEST(Metrics, LeaveOutTheContentsOfAStoreThatCannotBeRead) {
    ServiceFacts facts = sampleFacts();
    facts.store.reset();
    const std::string text = describeMetrics({}, facts);
    EXPECT_TRUE(samplesOf(text).contains("lumora_store_readable 0"));
    EXPECT_EQ(text.find("lumora_records "), std::string::npos);
}

TEST(Metrics, CountRequestsByPathAndStatus) {
    ServiceCounts counts;
    counts.requestAnswered(RequestKind::lookup, 200, microseconds(1));
    counts.requestAnswered(RequestKind::lookup, 200, microseconds(1));
    counts.requestAnswered(RequestKind::asset, 404, microseconds(1));
    counts.requestAnswered(RequestKind::unreadable, 418, microseconds(1));
    const auto samples = samplesOf(describeMetrics(counts.read(), sampleFacts()));
    EXPECT_TRUE(samples.contains(R"(lumora_requests_total{path="lookup",status="200"} 2)"));
    EXPECT_TRUE(samples.contains(R"(lumora_requests_total{path="asset",status="200"} 0)"));
    EXPECT_TRUE(samples.contains(R"(lumora_requests_total{path="asset",status="404"} 1)"));
    EXPECT_TRUE(samples.contains(R"(lumora_requests_total{path="unreadable",status="other"} 1)"));
}

TEST(Metrics, CountDurationsCumulatively) {
    ServiceCounts counts;
    counts.requestAnswered(RequestKind::lookup, 200, microseconds(-1));
    counts.requestAnswered(RequestKind::lookup, 200, microseconds(100));
    counts.requestAnswered(RequestKind::lookup, 200, microseconds(101));
    counts.requestAnswered(RequestKind::lookup, 200, microseconds(20'000'000));
    const auto samples = samplesOf(describeMetrics(counts.read(), sampleFacts()));
    const std::string bucket = R"(lumora_request_duration_seconds_bucket{path="lookup",le=)";
    EXPECT_TRUE(samples.contains(bucket + R"("0.0001"} 2)"));
    EXPECT_TRUE(samples.contains(bucket + R"("0.00025"} 3)"));
    EXPECT_TRUE(samples.contains(bucket + R"("10"} 3)"));
    EXPECT_TRUE(samples.contains(bucket + R"("+Inf"} 4)"));
    EXPECT_TRUE(samples.contains(R"(lumora_request_duration_seconds_count{path="lookup"} 4)"));
    EXPECT_TRUE(samples.contains(R"(lumora_request_duration_seconds_sum{path="lookup"} 20.000201)"));
}

TEST(Metrics, CountConnectionsAndRecords) {
    ServiceCounts counts;
    counts.connectionAccepted();
    counts.connectionAccepted();
    counts.connectionClosed();
    counts.connectionRefused();
    counts.handshakeFailed();
    counts.recordsAnswered(3, 2, 1);
    counts.storeFailed();
    const auto samples = samplesOf(describeMetrics(counts.read(), sampleFacts()));
    for (const char* line :
         {"lumora_connections_total 2", "lumora_open_connections 1", "lumora_refused_connections_total 1",
          "lumora_failed_handshakes_total 1", R"(lumora_looked_up_records_total{result="known"} 3)",
          R"(lumora_looked_up_records_total{result="unknown"} 2)", "lumora_cached_records_total 1",
          "lumora_store_failures_total 1"}) {
        EXPECT_TRUE(samples.contains(line)) << line;
    }
}

TEST(Metrics, AreBoundedInNumberForEveryRequest) {
    ServiceCounts counts;
    for (std::size_t kind = 0; kind < kRequestKinds; ++kind)
        for (int status = 0; status < 1000; ++status)
            counts.requestAnswered(static_cast<RequestKind>(kind), status, microseconds(status));
    EXPECT_LT(samplesOf(describeMetrics(counts.read(), sampleFacts())).size(), 300U);
}

}  // namespace
}  // namespace pinwell::lumora
