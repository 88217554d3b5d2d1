// Several instances of the service on one database, while one of them is killed.
#include <gtest/gtest.h>
#include <httplib.h>

#include <filesystem>
#include <memory>

#include "base/text.h"
#include "lumora-local/event.h"
#include "postgres_cluster.h"
#include "running_service.h"
#include "serving_instance.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using pinwell::test::Command;
using pinwell::test::ProcessResult;
using pinwell::test::readFile;
using pinwell::test::RunningProcess;
using pinwell::test::TemporaryDirectory;
using pinwell::test::writeFile;
using test::Load;
using test::ServingInstance;

void expectNothingLost(const Load& load, RecordStore& store) {
    const Load::Counts counts = load.counts();
    EXPECT_EQ(counts.wrongFailures, 0U);
    EXPECT_EQ(counts.wrongAnswers, 0U);
    EXPECT_EQ(counts.older, 0U);
    EXPECT_EQ(counts.exhausted, 0U);
    EXPECT_EQ(load.lost(store), std::vector<std::string>{});
    EXPECT_GE(verifyHistory(store, std::nullopt).events, counts.acknowledged);
    testing::Test::RecordProperty("acknowledged", std::to_string(counts.acknowledged));
    testing::Test::RecordProperty("answered", std::to_string(counts.answered));
    testing::Test::RecordProperty("retriable", std::to_string(counts.retriable));
    std::printf("%zu changes acknowledged, %zu to try again; %zu lookups answered, %zu to try again\n",
                counts.acknowledged, counts.refusedChanges, counts.answered, counts.retriable);
}

/// A service that has moved to a database in a new cluster.
class Team : public test::OwnClusterTest {
  protected:
    void SetUp() override {
        OwnClusterTest::SetUp();
        if (IsSkipped()) return;
        service_ = test::makeService(directory_, "service");
        const ProcessResult moved = test::runLumora({"migrate", service_, "--to", place_.url});
        ASSERT_EQ(moved.exitStatus, 0) << moved.errors;
    }

    const TemporaryDirectory directory_;
    std::string service_;
};

TEST_F(Team, LosesNothingWhenTheDatabaseIsKilledUnderLoad) {
    PostgresStore first(place_);
    PostgresStore second(place_);
    const ServingInstance instance(service_);
    Load load({&first, &second}, service_, instance.port(), 3);
    for (int round = 0; round < 4; ++round) {
        ASSERT_TRUE(load.goOn(30, 30)) << "round " << round;
        cluster_->stopImmediately();
        const std::size_t before = load.counts().retriable;
        while (load.counts().retriable < before + 3) std::this_thread::yield();
        cluster_->start();
    }
    ASSERT_TRUE(load.goOn(30, 30));
    load.stop();
    expectNothingLost(load, first);
    EXPECT_GT(load.counts().retriable, 0U);
    const ProcessResult verified = test::runLumora({"log", service_, "--verify"});
    EXPECT_EQ(verified.exitStatus, 0) << verified.errors;
}

TEST_F(Team, SeesEachRevocationThroughEveryInstanceOnceItIsAcknowledged) {
    const std::vector<std::string> names{"2/2/00000000000000000000000000000000000000aa",
                                         "2/2/00000000000000000000000000000000000000bb"};
    const ServingInstance first(service_);
    const ServingInstance second(service_);
    std::vector<std::unique_ptr<httplib::SSLClient>> clients;
    clients.push_back(test::clientOf(service_, first.port()));
    clients.push_back(test::clientOf(service_, second.port()));
    const std::string one = R"({"recordName":")" + names[0] + R"("})";
    const std::string both = one + R"(,{"recordName":")" + names[1] + R"("})";
    PostgresStore store(place_);
    const Occasion occasion{values::Date{100}, "tester", std::nullopt, "", true};
    for (int state = 1; state <= 40; ++state) {
        const std::string ticket = "ticket " + std::to_string(state);
        std::vector<SignedRecord> records;
        for (const std::string& name : names) {
            records.push_back(
                {{name, "made up", {}, state % 2 == 0, false, values::Date{state}}, base::toData(ticket)});
        }
        store.put(Environment::production, records, occasion);
        for (const auto& client : clients) {
            for (const std::string& asked : {one, both}) {
                const auto answer =
                    client->Post(test::kLookupPath, R"({"records":[)" + asked + "]}", "application/json");
                ASSERT_TRUE(answer);
                ASSERT_EQ(answer->status, 200);
                EXPECT_NE(answer->body.find(base::encodeBase64(base::toData(ticket))), std::string::npos)
                    << answer->body << " is older than " << ticket;
            }
        }
    }
}

/// HAProxy with the documented configuration, and with this test's addresses.
class BehindHaproxy : public Team {
  protected:
    static constexpr const char* kHaproxy = "/usr/sbin/haproxy";

    void SetUp() override {
        if (!std::filesystem::exists(kHaproxy)) GTEST_SKIP() << "HAProxy is not installed";
        Team::SetUp();
    }

    /// Starts it; its port is a free one.
    void balance(const std::vector<int>& ports) {
        std::string configuration = readFile(HAPROXY_CONFIGURATION);
        const auto replace = [&](const std::string& old, const std::string& text) {
            const std::size_t at = configuration.find(old);
            ASSERT_NE(at, std::string::npos) << old;
            configuration.replace(at, old.size(), text);
        };
        port_ = test::freePort();
        replace("0.0.0.0:8443", "127.0.0.1:" + std::to_string(port_));
        replace("/etc/lumora-local/platform", service_ + "/platform");
        replace("verifyhost tickets.example", "verifyhost 127.0.0.1");
        for (std::size_t i = 0; i < ports.size(); ++i) {
            replace("192.0.2." + std::to_string(i + 1) + ":8443", "127.0.0.1:" + std::to_string(ports[i]));
        }
        writeFile(directory_ / "haproxy.cfg", configuration);
        proxy_ = std::make_unique<RunningProcess>(
            Command{.executable = kHaproxy, .arguments = {"-W", "-db", "-f", directory_ / "haproxy.cfg"}});
    }

    int port_ = 0;
    std::unique_ptr<RunningProcess> proxy_;
};

TEST_F(BehindHaproxy, LosesNothingWhenAnInstanceIsKilledUnderLoad) {
    PostgresStore first(place_);
    PostgresStore second(place_);
    std::vector<std::unique_ptr<ServingInstance>> instances;
    for (int i = 0; i < 3; ++i) instances.push_back(std::make_unique<ServingInstance>(service_));
    balance({instances[0]->port(), instances[1]->port(), instances[2]->port()});
    if (HasFatalFailure()) return;
    Load load({&first, &second}, service_, port_, 4);
    ASSERT_TRUE(load.goOn(20, 40)) << proxy_->resultSoFar().errors;
    instances[0]->kill();
    ASSERT_TRUE(load.goOn(20, 40)) << proxy_->resultSoFar().errors;
    instances[1]->kill();
    ASSERT_TRUE(load.goOn(20, 40)) << proxy_->resultSoFar().errors;
    cluster_->stopImmediately();
    cluster_->start();
    ASSERT_TRUE(load.goOn(20, 40)) << proxy_->resultSoFar().errors;
    load.stop();
    expectNothingLost(load, first);
}

}  // namespace
}  // namespace pinwell::lumora
