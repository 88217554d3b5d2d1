// The metrics of the running program, as a scraper reads them.
#include <gtest/gtest.h>
#include <httplib.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <thread>

#include "running_service.h"
#include "support/process.h"
#include "support/temporary_directory.h"
#include "support/text.h"

namespace pinwell::lumora {
namespace {

using pinwell::test::linesOf;
using test::RunningService;

constexpr const char* kUnknownName = "2/2/00000000000000000000000000000000000000ff";

CodeHash hashOfSample(int fill) {
    return {2, base::Data(20, static_cast<std::byte>(fill))};
}

std::string bodyFor(const std::string& name) {
    return R"({"records":[{"recordName":")" + name + R"("}]})";
}

class ServedMetrics : public ::testing::Test {
  protected:
    void SetUp() override {
        service_.emplace(std::vector<std::string>{"--metrics-listen", "127.0.0.1:0"});
        constexpr std::string_view kPrefix = "metrics at http://127.0.0.1:";
        for (const std::string& line : linesOf(service_->output()))
            if (line.starts_with(kPrefix)) port_ = std::stoi(line.substr(kPrefix.size()));
        ASSERT_GT(port_, 0) << service_->output();
    }

    std::string scrape() const {
        httplib::Client client("127.0.0.1", port_);
        const auto answer = client.Get("/metrics");
        if (!answer || answer->status != 200) {
            ADD_FAILURE() << "no metrics";
            return {};
        }
        EXPECT_EQ(answer->get_header_value("Content-Type"), "text/plain; version=0.0.4; charset=utf-8");
        return answer->body;
    }

    /// The value of a sample; its labels are part of the name.
    double valueOf(const std::string& sample) const {
        for (const std::string& line : linesOf(scrape()))
            if (line.starts_with(sample + " ")) return std::stod(line.substr(sample.size() + 1));
        ADD_FAILURE() << sample << " is not among the metrics";
        return -1;
    }

    void lookUp(const std::string& name) const {
        const auto answer = service_->client()->Post(test::kLookupPath, bodyFor(name), "application/json");
        ASSERT_TRUE(answer);
        ASSERT_EQ(answer->status, 200);
    }

    std::optional<RunningService> service_;
    int port_ = 0;
};

TEST_F(ServedMetrics, CountRequestsOfClients) {
    const std::string name = service_->put(hashOfSample(1));
    lookUp(name);
    lookUp(name);  // from memory
    lookUp(kUnknownName);
    EXPECT_EQ(service_->client()->Get("/nothing")->status, 404);
    EXPECT_EQ(valueOf(R"(lumora_requests_total{path="lookup",status="200"})"), 3);
    EXPECT_EQ(valueOf(R"(lumora_requests_total{path="other",status="404"})"), 1);
    EXPECT_EQ(valueOf(R"(lumora_looked_up_records_total{result="known"})"), 2);
    EXPECT_EQ(valueOf(R"(lumora_looked_up_records_total{result="unknown"})"), 1);
    EXPECT_EQ(valueOf("lumora_cached_records_total"), 1);
    EXPECT_EQ(valueOf("lumora_connections_total"), 4);
    EXPECT_EQ(valueOf(R"(lumora_request_duration_seconds_count{path="lookup"})"), 3);
    EXPECT_EQ(valueOf("lumora_records"), 1);
    EXPECT_EQ(valueOf("lumora_events_total"), 1);
    EXPECT_GT(valueOf(R"(lumora_certificate_expiry_timestamp_seconds{certificate="server"})"),
              valueOf("lumora_start_time_seconds"));
    EXPECT_GT(valueOf(R"(lumora_certificate_expiry_timestamp_seconds{certificate="root"})"), 0);
}

TEST_F(ServedMetrics, NameNoRecordAndNoClient) {
    const std::string name = service_->put(hashOfSample(1));
    lookUp(name);
    const std::string metrics = scrape();
    EXPECT_EQ(metrics.find(name), std::string::npos);
    EXPECT_EQ(metrics.find("127.0.0.1"), std::string::npos);
}

TEST_F(ServedMetrics, ReportLostRecords) {
    const std::string name = service_->put(hashOfSample(1));
    std::filesystem::rename(service_->directory().storePath(), service_->path() + "/elsewhere");
    EXPECT_EQ(service_->client()->Post(test::kLookupPath, bodyFor(name), "application/json")->status, 503);
    EXPECT_EQ(valueOf("lumora_store_readable"), 0);
    EXPECT_EQ(valueOf("lumora_store_failures_total"), 1);
    EXPECT_EQ(valueOf(R"(lumora_requests_total{path="lookup",status="503"})"), 1);
}

TEST_F(ServedMetrics, FollowAServerCertificateThatIsReplaced) {
    const std::string sample = R"(lumora_certificate_expiry_timestamp_seconds{certificate="server"})";
    const double before = valueOf(sample);
    // The new certificate is made in a later second, so that its end is later too.
    std::this_thread::sleep_for(std::chrono::milliseconds(1100));
    ASSERT_EQ(test::runProgram({"rotate", service_->path(), "server"}).exitStatus, 0);
    EXPECT_EQ(valueOf(sample), before);
    service_->sendSignal(SIGHUP);
    while (service_->output().find("read the certificate") == std::string::npos)
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    EXPECT_GT(valueOf(sample), before);
}

TEST_F(ServedMetrics, AreOnlyOnTheirOwnListener) {
    EXPECT_EQ(service_->client()->Get("/metrics")->status, 404);
    httplib::Client client("127.0.0.1", port_);
    EXPECT_EQ(client.Get("/healthz")->status, 404);
    EXPECT_EQ(client.Get("/metrics/")->status, 404);
    const auto post = client.Post("/metrics");
    ASSERT_TRUE(post);
    EXPECT_EQ(post->status, 405);
    EXPECT_EQ(post->get_header_value("Allow"), "GET, HEAD");
    const auto head = client.Head("/metrics");
    ASSERT_TRUE(head);
    EXPECT_EQ(head->status, 200);
    EXPECT_EQ(head->body, "");
}

TEST_F(ServedMetrics, AreAvailableDespiteSilentAndHostileClients) {
    httplib::Client large("127.0.0.1", port_);
    EXPECT_FALSE(large.Get("/metrics", {{"X-Large", std::string(100'000, 'x')}}));
    std::vector<std::unique_ptr<httplib::Client>> clients;
    for (int i = 0; i < 40; ++i) {
        clients.push_back(std::make_unique<httplib::Client>("127.0.0.1", port_));
        clients.back()->set_keep_alive(true);
        EXPECT_EQ(clients.back()->Get("/metrics")->status, 200);
    }
    EXPECT_EQ(valueOf("lumora_store_readable"), 1);
}

TEST_F(ServedMetrics, AreAcceptedByPrometheus) {
    const std::string name = service_->put(hashOfSample(1));
    lookUp(name);
    const pinwell::test::TemporaryDirectory directory;
    pinwell::test::writeFile(directory / "metrics", scrape());
    if (std::system("command -v promtool > /dev/null") != 0) GTEST_SKIP() << "promtool is not installed";
    const std::string command =
        "promtool check metrics < " + (directory / "metrics") + " > " + (directory / "out") + " 2>&1";
    EXPECT_EQ(std::system(command.c_str()), 0) << pinwell::test::readFile(directory / "out");
}

TEST(MetricsOption, IsRefusedWithoutAnAddress) {
    const RunningService service;
    const auto outcome = test::runProgram({"serve", "--metrics-listen", "no address", service.path()});
    EXPECT_EQ(outcome.exitStatus, 64);
    EXPECT_NE(outcome.err.find("no address is not ADDRESS:PORT"), std::string::npos) << outcome.err;
}

TEST(MetricsOption, IsOffByDefault) {
    const RunningService service;
    EXPECT_EQ(service.output().find("metrics"), std::string::npos);
}

}  // namespace
}  // namespace pinwell::lumora
