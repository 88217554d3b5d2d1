// The running service, and clients that issue and revoke from elsewhere.
#include <gtest/gtest.h>
#include <httplib.h>
#include <signal.h>

#include <atomic>
#include <filesystem>
#include <thread>

#include "admin_instance.h"
#include "lumora-local/event.h"
#include "lumora-local/sqlite_store.h"
#include "running_service.h"
#include "serving_instance.h"
#include "support/file_size_limit.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using pinwell::test::ProcessResult;
using pinwell::test::writeFile;
using test::AdminAnswer;
using test::AdminClient;
using test::AdminInstance;
using test::bodyFor;
using test::recordNamed;
using test::ServiceWithClients;
using values::Value;

constexpr const char* kTickets = "/v1/tickets";
constexpr const char* kRevocations = "/v1/revocations";

Value parsed(const AdminAnswer& answer) {
    auto value = values::parseJSON(base::asBytes(answer.body));
    if (!value) throw std::runtime_error("no JSON: " + answer.body);
    return *std::move(value);
}

std::string textOf(const AdminAnswer& answer, std::string_view member) {
    const Value document = parsed(answer);
    const std::string* text = document[member].string();
    return text != nullptr ? *text : "";
}

class AdminServeTest : public testing::Test {
  protected:
    std::vector<Event> events() const {
        SqliteStore store(service_.path() + "/service/records.sqlite");
        std::vector<Event> all;
        store.forEachEvent({}, [&](const Event& event) { all.push_back(event); });
        return all;
    }

    HistorySummary verified() const {
        SqliteStore store(service_.path() + "/service/records.sqlite");
        return verifyHistory(store, std::nullopt);
    }

    /// Until it does, or a minute is over.
    template <class Condition>
    static bool comesTrue(Condition condition) {
        const auto end = std::chrono::steady_clock::now() + std::chrono::minutes(1);
        while (!condition()) {
            if (std::chrono::steady_clock::now() > end) return false;
            std::this_thread::sleep_for(std::chrono::milliseconds(20));
        }
        return true;
    }

    const ServiceWithClients service_;
};

TEST_F(AdminServeTest, IssuesTheTicketThatLookupsDeliver) {
    AdminInstance instance(service_);
    const AdminAnswer issued =
        instance.client("ci.example")
            .post(kTickets, bodyFor(recordNamed(1), R"("label":"Example.app","comment":"build 7")"));
    ASSERT_EQ(issued.status, 201) << issued.body;
    EXPECT_EQ(textOf(issued, "action"), "issued");
    const auto lookup =
        test::clientOf(service_.path(), instance.port())
            ->Post(test::kLookupPath, R"({"records":[{"recordName":")" + recordNamed(1) + R"("}]})",
                   "application/json");
    ASSERT_TRUE(lookup);
    EXPECT_NE(lookup->body.find(textOf(issued, "ticket")), std::string::npos);
    const std::vector<Event> all = events();
    ASSERT_EQ(all.size(), 1U);
    EXPECT_EQ(all[0].actor, "ci.example");
    EXPECT_EQ(all[0].label, "Example.app");
    EXPECT_EQ(all[0].comment, "build 7");
    EXPECT_EQ(all[0].hash, textOf(issued, "event"));
}

TEST_F(AdminServeTest, ListsEveryHashInTheTicketTheRecordsOwnFirst) {
    AdminInstance instance(service_);
    AdminClient client = instance.client("ci.example");
    const std::string hashes =
        "\"hashes\":[\"" + recordNamed(2) + "\",\"" + recordNamed(1) + "\",\"" + recordNamed(2) + "\"]";
    ASSERT_EQ(client.post(kTickets, bodyFor(recordNamed(1), hashes)).status, 201);
    const Value found = parsed(client.get("/v1/records?hash=" + recordNamed(2)));
    ASSERT_EQ(found["records"].array()->size(), 1U);
    const values::Array& listed = *found["records"][0]["hashes"].array();
    ASSERT_EQ(listed.size(), 2U);
    EXPECT_EQ(*listed[0].string(), recordNamed(1));
    EXPECT_EQ(*listed[1].string(), recordNamed(2));
}

// The service may write only in its own directory, and a change of many rows must not need another place.
TEST_F(AdminServeTest, ReissuesAndRevokesARecordOfThousandsOfHashes) {
    AdminInstance instance(service_);
    AdminClient manager = instance.client("manager");
    std::string hashes = "\"hashes\":[";
    for (int i = 2; i < 4000; ++i) hashes += (i > 2 ? ",\"" : "\"") + recordNamed(i) + "\"";
    const std::string body = bodyFor(recordNamed(1), hashes + "]");
    EXPECT_EQ(manager.post(kTickets, body).status, 201);
    EXPECT_EQ(manager.post(kTickets, body).status, 200);
    const AdminAnswer revoked = manager.post(kRevocations, bodyFor(recordNamed(1)));
    EXPECT_EQ(revoked.status, 200) << revoked.body;
}

TEST_F(AdminServeTest, AppliesTheRulesOfTheCommandLine) {
    AdminInstance instance(service_);
    AdminClient manager = instance.client("manager");
    AdminClient builder = instance.client("ci.example");
    const std::string record = recordNamed(1);
    EXPECT_EQ(manager.post(kRevocations, bodyFor(record)).status, 404);
    EXPECT_EQ(builder.post(kTickets, bodyFor(record)).status, 201);
    EXPECT_EQ(builder.post(kTickets, bodyFor(record)).status, 200);
    EXPECT_EQ(builder.post(kRevocations, bodyFor(record)).status, 403);
    const AdminAnswer revoked = manager.post(kRevocations, bodyFor(record, R"("reason":"compromised")"));
    EXPECT_EQ(revoked.status, 200) << revoked.body;
    EXPECT_EQ(builder.post(kTickets, bodyFor(record)).status, 409);
    EXPECT_EQ(builder.post(kTickets, bodyFor(recordNamed(2), "\"hashes\":[\"" + record + "\"]")).status, 409);
    const std::string reinstating = bodyFor(record, R"("reinstate":true,"comment":"a mistake")");
    EXPECT_EQ(builder.post(kTickets, reinstating).status, 403);
    const AdminAnswer reinstated = manager.post(kTickets, reinstating);
    EXPECT_EQ(reinstated.status, 200);
    EXPECT_EQ(textOf(reinstated, "action"), "reinstated");
    EXPECT_EQ(verified().events, 9U);
}

TEST_F(AdminServeTest, ReturnsTheSameResponseToARepeatedRequest) {
    AdminInstance instance(service_);
    AdminClient client = instance.client("manager");
    const AdminAnswer first = client.post(kTickets, bodyFor(recordNamed(1)), "one");
    EXPECT_EQ(client.post(kTickets, bodyFor(recordNamed(1)), "two").status, 200);
    EXPECT_EQ(client.post(kRevocations, bodyFor(recordNamed(1)), "three").status, 200);
    const AdminAnswer again = client.post(kTickets, bodyFor(recordNamed(1)), "\"one\"");
    EXPECT_EQ(again.status, first.status);
    EXPECT_EQ(again.body, first.body);
    EXPECT_EQ(client.post(kTickets, bodyFor(recordNamed(2)), "one").status, 422);
    EXPECT_EQ(client.post(kRevocations, bodyFor(recordNamed(1)), "one").status, 422);
    EXPECT_EQ(instance.client("ci.example").post(kTickets, bodyFor(recordNamed(3)), "one").status, 201);
    const std::vector<Event> all = events();
    EXPECT_EQ(std::count_if(all.begin(), all.end(),
                            [](const Event& event) { return event.action != Action::refused; }),
              4);
}

TEST_F(AdminServeTest, RecognisesARepeatedRequestAfterAKill) {
    // Wherever the kill interrupts the first attempt, the repeated request is carried out once.
    std::vector<std::string> records;
    for (int round = 0; round < 6; ++round) {
        auto instance = std::make_unique<AdminInstance>(service_);
        std::atomic<int> sent{0};
        std::thread client([&] {
            AdminClient unlucky = instance->client("ci.example");
            for (int i = 0; i < 40; ++i) {
                const int number = round * 100 + i;
                ++sent;
                if (unlucky.post(kTickets, bodyFor(recordNamed(number)), "key-" + std::to_string(number))
                        .status < 0)
                    return;
            }
        });
        while (sent < 3 + round * 2) std::this_thread::yield();
        instance->process().sendSignal(SIGKILL);
        client.join();
        instance->process().wait();

        const AdminInstance next(service_);
        AdminClient lucky = next.client("ci.example");
        for (int i = 0; i < sent; ++i) {
            const int number = round * 100 + i;
            const AdminAnswer answer =
                lucky.post(kTickets, bodyFor(recordNamed(number)), "key-" + std::to_string(number));
            EXPECT_EQ(answer.status, 201) << answer.body;
            records.push_back(recordNamed(number));
        }
    }
    std::map<std::string, int> counts;
    for (const Event& event : events()) ++counts[event.record];
    for (const std::string& record : records) EXPECT_EQ(counts[record], 1) << record;
    EXPECT_EQ(verified().events, records.size());
}

TEST_F(AdminServeTest, ReadsItsAccessListAgainOnHangUp) {
    AdminInstance instance(service_);
    AdminClient client = instance.client("auditor");
    EXPECT_EQ(client.get("/v1/records").status, 200);
    writeFile(service_.accessPath(), "[clients]\nstranger = [\"read\"]\n");
    EXPECT_EQ(client.get("/v1/records").status, 200);
    instance.process().sendSignal(SIGHUP);
    ASSERT_TRUE(instance.process().waitForLine("read the certificate and the key again"));
    EXPECT_EQ(instance.client("auditor").get("/v1/records").status, 403);
    EXPECT_EQ(instance.client("stranger").get("/v1/records").status, 200);

    writeFile(service_.accessPath(), "[clients]\nstranger = read\n");
    instance.process().sendSignal(SIGHUP);
    ASSERT_TRUE(comesTrue([&] { return instance.client("stranger").get("/v1/records").status == 200; }));
    const ProcessResult end = instance.stop();
    EXPECT_NE(end.errors.find("access.toml:2: "), std::string::npos) << end.errors;
    EXPECT_NE(end.errors.find("the service goes on with the access list that it has"), std::string::npos)
        << end.errors;
}

TEST_F(AdminServeTest, ReadsItsAccessListAgainDespiteAnInvalidServiceJson) {
    AdminInstance instance(service_);
    EXPECT_EQ(instance.client("auditor").get("/v1/records").status, 200);
    writeFile(service_.path() + "/service/service.json", "{");
    writeFile(service_.accessPath(), "[clients]\n");
    instance.process().sendSignal(SIGHUP);
    ASSERT_TRUE(instance.process().waitForLine("read access.toml again"));
    EXPECT_EQ(instance.client("auditor").get("/v1/records").status, 403);
}

TEST_F(AdminServeTest, ClosesConnectionsOfAReplacedAuthority) {
    AdminInstance instance(service_);
    AdminClient client = instance.client("auditor");
    EXPECT_EQ(client.get("/v1/records").status, 200);
    std::filesystem::copy_file(service_.path() + "/service/root.pem", service_.authority(),
                               std::filesystem::copy_options::overwrite_existing);
    instance.process().sendSignal(SIGHUP);
    ASSERT_TRUE(instance.process().waitForLine("read the certificate and the key again"));
    EXPECT_EQ(client.get("/v1/records").status, -1);
}

TEST_F(AdminServeTest, SignsWithTheRotatedKeyAfterHangUp) {
    AdminInstance instance(service_);
    const std::string before =
        textOf(instance.client("ci.example").post(kTickets, bodyFor(recordNamed(1))), "ticket");
    ASSERT_EQ(test::runLumora({"rotate", service_.path(), "signer"}).exitStatus, 0);
    instance.process().sendSignal(SIGHUP);
    ASSERT_TRUE(instance.process().waitForLine("read the certificate and the key again"));
    const std::string after =
        textOf(instance.client("ci.example").post(kTickets, bodyFor(recordNamed(1))), "ticket");
    // The signer's certificate is at the front, after a head of 16 bytes.
    EXPECT_NE(before.substr(24, 200), after.substr(24, 200));
}

TEST_F(AdminServeTest, NamesTheClientInTheAccessLog) {
    AdminInstance instance(service_);
    EXPECT_EQ(instance.client("stranger").post(kTickets, bodyFor(recordNamed(1))).status, 403);
    const ProcessResult end = instance.stop();
    EXPECT_EQ(end.exitStatus, 0);
    EXPECT_NE(end.output.find("\"POST /v1/tickets\" 403 "), std::string::npos) << end.output;
    EXPECT_NE(end.output.find("\"stranger\""), std::string::npos) << end.output;
    const std::vector<Event> all = events();
    ASSERT_EQ(all.size(), 1U);
    EXPECT_EQ(all[0].action, Action::refused);
    EXPECT_EQ(all[0].actor, "stranger");
}

TEST_F(AdminServeTest, CountsItsRequests) {
    if (!HAS_METRICS) GTEST_SKIP() << "this build is without metrics";
    AdminInstance instance(service_, "", {"--metrics-listen", "127.0.0.1:0"});
    EXPECT_EQ(instance.client("stranger").post(kTickets, bodyFor(recordNamed(1))).status, 403);
    EXPECT_EQ(instance.client("ci.example").post(kTickets, bodyFor(recordNamed(1))).status, 201);
    const auto line = instance.process().waitForLineWith("metrics at ");
    ASSERT_TRUE(line);
    httplib::Client scraper("127.0.0.1", std::stoi(line->substr(line->rfind("127.0.0.1:") + 10)));
    const auto scraped = scraper.Get("/metrics");
    ASSERT_TRUE(scraped);
    for (const char* status : {"201", "403"}) {
        const std::string sample =
            std::string("lumora_requests_total{path=\"administration\",status=\"") + status + "\"} 1\n";
        EXPECT_NE(scraped->body.find(sample), std::string::npos) << scraped->body;
    }
}

TEST_F(AdminServeTest, AsksAClientWithTooManyRequestsToWait) {
    AdminInstance instance(service_);
    AdminClient client = instance.client("auditor");
    AdminAnswer last;
    for (int i = 0; i < 1000 && last.status != 429; ++i) last = client.get("/v1/records");
    EXPECT_EQ(last.status, 429);
    EXPECT_EQ(last.header("Retry-After"), "1");
    EXPECT_EQ(instance.client("manager").get("/v1/records").status, 200);
}

TEST_F(AdminServeTest, RefusesTooLargeBodiesWithAProblemDocument) {
    AdminInstance instance(service_);
    AdminClient client = instance.client("ci.example");
    const AdminAnswer body = client.post(kTickets, std::string(1024 * 1024 + 1, ' '));
    EXPECT_EQ(body.status, 413);
    EXPECT_EQ(body.header("Content-Type"), "application/problem+json");
    const AdminAnswer target =
        instance.client("ci.example").get("/v1/records?name=" + std::string(4000, 'x'));
    EXPECT_EQ(target.status, 414);
    EXPECT_EQ(target.header("Content-Type"), "application/problem+json");
    const AdminAnswer head = instance.client("ci.example").post(kTickets, "{}", std::string(70'000, 'k'));
    EXPECT_EQ(head.status, 431);
}

TEST_F(AdminServeTest, KeepsAcknowledgedChangesWhenTheDiskIsFull) {
    std::unique_ptr<AdminInstance> instance;
    {
        const auto size = std::filesystem::file_size(service_.path() + "/service/records.sqlite");
        const pinwell::test::FileSizeLimit limit(size + std::size_t{64} * 1024);
        instance = std::make_unique<AdminInstance>(service_);
    }
    AdminClient client = instance->client("ci.example");
    std::vector<std::string> acknowledged;
    AdminAnswer last;
    for (int i = 0; i < 150 && last.status != 503; ++i) {
        last = client.post(kTickets, bodyFor(recordNamed(i)), "key-" + std::to_string(i));
        if (last.status == 201) acknowledged.push_back(recordNamed(i));
    }
    ASSERT_EQ(last.status, 503) << acknowledged.size();
    EXPECT_EQ(last.header("Retry-After"), "1");
    EXPECT_EQ(last.header("Content-Type"), "application/problem+json");
    instance->kill();
    EXPECT_EQ(verified().events, acknowledged.size());
    EXPECT_FALSE(acknowledged.empty());
}

TEST_F(AdminServeTest, ListensIfServiceJsonHasTheSettings) {
    writeFile(service_.path() + "/service/service.json",
              R"({"hosts":["127.0.0.1"],"admin":{"listen":"127.0.0.1:0","clients":"clients/ca.pem"}})");
    pinwell::test::RunningProcess process({.executable = LUMORA_LOCAL,
                                           .arguments = {"serve", service_.path(), "--listen", "127.0.0.1:0"},
                                           .environment = {{"PATH", "/usr/bin:/bin"}}});
    EXPECT_TRUE(process.waitForLine("administration at https://127.0.0.1:"));
}

TEST_F(AdminServeTest, DoesNotListenByDefault) {
    pinwell::test::RunningProcess process({.executable = LUMORA_LOCAL,
                                           .arguments = {"serve", service_.path(), "--listen", "127.0.0.1:0"},
                                           .environment = {{"PATH", "/usr/bin:/bin"}}});
    ASSERT_TRUE(process.waitForLine("ready at "));
    EXPECT_EQ(process.resultSoFar().output.find("administration"), std::string::npos);
}

/// If the service cannot start, it prints one line that names the file, and ends with 78.
class AdminStartTest : public AdminServeTest {
  protected:
    void expectRefused(const std::vector<std::string>& options, int exitStatus,
                       const std::string& part) const {
        std::vector<std::string> arguments{"serve", service_.path(), "--listen", "127.0.0.1:0"};
        arguments.insert(arguments.end(), options.begin(), options.end());
        const ProcessResult result = test::runLumora(arguments);
        EXPECT_EQ(result.exitStatus, exitStatus) << result.errors;
        EXPECT_NE(result.errors.find(part), std::string::npos) << result.errors;
        EXPECT_EQ(std::count(result.errors.begin(), result.errors.end(), '\n'), 1) << result.errors;
    }

    std::vector<std::string> both(const std::string& authorities) const {
        return {"--admin-listen", "127.0.0.1:0", "--client-ca", authorities};
    }
};

TEST_F(AdminStartTest, RequiresBothOptions) {
    expectRefused({"--admin-listen", "127.0.0.1:0"}, 64, "--admin-listen and --client-ca go together");
    expectRefused({"--client-ca", service_.authority()}, 64, "--admin-listen and --client-ca go together");
    expectRefused({"--admin-listen", "nowhere at all", "--client-ca", service_.authority()}, 64,
                  "ADDRESS:PORT");
}

TEST_F(AdminStartTest, RequiresAUsableAccessList) {
    writeFile(service_.accessPath(), "[clients]\n\"a\" = \"read\"\n");
    expectRefused(both(service_.authority()), 78, "/service/access.toml:2: ");
    std::filesystem::remove(service_.accessPath());
    expectRefused(both(service_.authority()), 78, "/service/access.toml: ");
}

TEST_F(AdminStartTest, RequiresCertificatesOfAuthorities) {
    expectRefused(both(service_.folderOf("manager") + "/client.pem"), 78, "not an authority's: manager");
    expectRefused(both(service_.accessPath()), 78, "there is no certificate in");
    expectRefused(both(service_.scratch("nothing")), 66, "nothing");
}

TEST_F(AdminStartTest, RequiresAServiceThatMayChangeRecords) {
    writeFile(service_.path() + "/service/service.json", R"({"hosts":["127.0.0.1"],"role":"lookup"})");
    expectRefused(both(service_.authority()), 78, "\"role\" is lookup");
}

TEST_F(AdminStartTest, RequiresTheSigningKey) {
    std::filesystem::remove(service_.path() + "/service/ticket-signer.key");
    expectRefused(both(service_.authority()), 66, "ticket-signer.key");
}

TEST_F(AdminStartTest, RefusesUnknownSettings) {
    const auto settings = [&](const std::string& admin) {
        writeFile(service_.path() + "/service/service.json",
                  R"({"hosts":["127.0.0.1"],"admin":)" + admin + "}");
    };
    settings("7");
    expectRefused({}, 78, "\"admin\" is not an object");
    settings(R"({"listen":"127.0.0.1:0"})");
    expectRefused({}, 78, "\"admin.clients\" is missing");
    settings(R"({"listen":"not a host:1","clients":"clients/ca.pem"})");
    expectRefused({}, 78, "\"admin.listen\" is not ADDRESS:PORT");
    settings(R"({"listen":"127.0.0.1:0","clients":"clients/ca.pem","port":1})");
    expectRefused({}, 78, "unknown key \"admin.port\"");
}

TEST(ClientCertificate, IsRefusedForAnInvalidName) {
    const pinwell::test::TemporaryDirectory directory;
    const std::string service = test::makeService(directory, "service");
    for (const std::string& name :
         {std::string(), std::string(65, 'x'), std::string("a\nb"), std::string("\xff")}) {
        const ProcessResult result =
            test::runLumora({"client-certificate", service, name, "--out", directory / "out"});
        EXPECT_EQ(result.exitStatus, 64) << name << result.errors;
        EXPECT_FALSE(std::filesystem::exists(directory / "out"));
    }
    EXPECT_EQ(test::runLumora({"client-certificate", service, "name"}).exitStatus, 64);
    EXPECT_EQ(test::runLumora({"client-certificate", service, "--out", directory / "out"}).exitStatus, 64);
    EXPECT_EQ(
        test::runLumora({"client-certificate", directory / "absent", "name", "--out", directory / "out"})
            .exitStatus,
        66);
}

TEST(ClientCertificate, OverwritesNothingAndHasAPrivateKeyFile) {
    const pinwell::test::TemporaryDirectory directory;
    const std::string service = test::makeService(directory, "service");
    const auto make = [&] {
        return test::runLumora({"client-certificate", service, "a", "--out", directory / "out"});
    };
    ASSERT_EQ(make().exitStatus, 0);
    const std::string key = pinwell::test::readFile(directory / "out/client.key");
    EXPECT_EQ(make().exitStatus, 73);
    EXPECT_EQ(pinwell::test::readFile(directory / "out/client.key"), key);
    for (const std::string& path : {directory / "out/client.key", service + "/service/clients/ca.key"}) {
        EXPECT_EQ(std::filesystem::status(path).permissions(),
                  std::filesystem::perms::owner_read | std::filesystem::perms::owner_write);
    }
}

}  // namespace
}  // namespace pinwell::lumora
