// Two instances with administration listeners on one database.
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <thread>

#include "admin_instance.h"
#include "lumora-local/event.h"
#include "postgres_cluster.h"
#include "serving_instance.h"

namespace pinwell::lumora {
namespace {

using test::AdminAnswer;
using test::AdminClient;
using test::AdminInstance;
using test::bodyFor;
using test::recordNamed;

constexpr const char* kTicketsPath = "/v1/tickets";

class AdminTeamTest : public test::OwnClusterTest {
  protected:
    void SetUp() override {
        OwnClusterTest::SetUp();
        if (IsSkipped()) return;
        const auto moved = test::runLumora({"migrate", service_.path(), "--to", place_.url});
        ASSERT_EQ(moved.exitStatus, 0) << moved.errors;
    }

    const test::ServiceWithClients service_;
};

TEST_F(AdminTeamTest, ReturnsTheOtherInstancesResponseToARepeatedRequest) {
    AdminInstance first(service_);
    AdminInstance second(service_);
    const AdminAnswer issued = first.client("ci.example").post(kTicketsPath, bodyFor(recordNamed(1)), "one");
    ASSERT_EQ(issued.status, 201) << issued.body;
    const AdminAnswer again = second.client("ci.example").post(kTicketsPath, bodyFor(recordNamed(1)), "one");
    EXPECT_EQ(again.status, 201);
    EXPECT_EQ(again.body, issued.body);
    EXPECT_EQ(second.client("ci.example").post(kTicketsPath, bodyFor(recordNamed(2)), "one").status, 422);
    EXPECT_EQ(second.client("auditor").get("/v1/events").status, 200);
    PostgresStore store(place_);
    EXPECT_EQ(verifyHistory(store, std::nullopt).events, 2U);
}

TEST_F(AdminTeamTest, CarriesOutOnceARequestThatIsSentToBothInstances) {
    AdminInstance first(service_);
    AdminInstance second(service_);
    std::vector<std::string> bodies(2);
    for (int i = 0; i < 10; ++i) {
        std::vector<std::thread> threads;
        for (std::size_t side = 0; side < 2; ++side) {
            threads.emplace_back([&, side, i] {
                bodies[side] = (side == 0 ? first : second)
                                   .client("ci.example")
                                   .post(kTicketsPath, bodyFor(recordNamed(i)), "key-" + std::to_string(i))
                                   .body;
            });
        }
        for (std::thread& thread : threads) thread.join();
        EXPECT_EQ(bodies[0], bodies[1]);
    }
    PostgresStore store(place_);
    EXPECT_EQ(verifyHistory(store, std::nullopt).events, 10U);
}

TEST_F(AdminTeamTest, KeepsAcknowledgedChangesWhenTheDatabaseIsKilled) {
    constexpr int kRequests = 40;
    AdminInstance instance(service_);
    std::atomic<int> acknowledged{0};
    std::atomic<int> unavailable{0};
    std::thread requests([&] {
        AdminClient client = instance.client("ci.example");
        for (int i = 0; i < kRequests; ++i) {
            AdminAnswer answer;
            for (int attempt = 0; attempt < 200 && answer.status != 201; ++attempt) {
                answer = client.post(kTicketsPath, bodyFor(recordNamed(i)), "key-" + std::to_string(i));
                if (answer.status == 201) break;
                EXPECT_EQ(answer.status, 503) << answer.body;
                EXPECT_EQ(answer.header("Retry-After"), "1");
                ++unavailable;
                std::this_thread::sleep_for(std::chrono::milliseconds(50));
            }
            EXPECT_EQ(answer.status, 201) << answer.body;
            ++acknowledged;
        }
    });
    for (const int moment : {5, 15, 25}) {
        while (acknowledged < moment) std::this_thread::yield();
        cluster_->stopImmediately();
        cluster_->start();
    }
    requests.join();
    PostgresStore store(place_);
    EXPECT_EQ(verifyHistory(store, std::nullopt).events, static_cast<std::size_t>(kRequests));
    std::printf("%d attempts to be repeated\n", unavailable.load());
}

TEST_F(AdminTeamTest, IsUnavailableWhileTheDatabaseIsAway) {
    AdminInstance instance(service_);
    EXPECT_EQ(instance.client("auditor").get("/v1/records").status, 200);
    cluster_->stopImmediately();
    const AdminAnswer reading = instance.client("auditor").get("/v1/records");
    EXPECT_EQ(reading.status, 503);
    EXPECT_EQ(reading.header("Retry-After"), "1");
    EXPECT_EQ(test::healthOf(service_.path(), instance.port()), 503);
    cluster_->start();
    EXPECT_EQ(instance.client("auditor").get("/v1/records").status, 200);
}

}  // namespace
}  // namespace pinwell::lumora
