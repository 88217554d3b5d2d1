// Moving a service's records into a database, and the messages about unsuitable databases.
#include "lumora-local/service_store.h"

#include <SQLiteCpp/SQLiteCpp.h>
#include <gtest/gtest.h>

#include <algorithm>

#include "killed_child.h"
#include "lumora-local/event.h"
#include "lumora-local/failure.h"
#include "lumora-local/sqlite_store.h"
#include "postgres_cluster.h"
#include "serving_instance.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using pinwell::test::ProcessResult;
using pinwell::test::readFile;
using pinwell::test::TemporaryDirectory;
using pinwell::test::writeFile;
using test::PostgresCluster;
using values::Date;

constexpr Environment kProduction = Environment::production;
constexpr const char* kRecord = "2/2/00112233445566778899aabbccddeeff00112233";

SignedRecord makeRecord(const std::string& name, std::string_view ticket, bool revoked = false) {
    Data hash = base::toData(name);
    hash.resize(20);
    return {{name,
             "Sample\xff.app",
             {{2, hash}, {4, Data(48, std::byte{2})}},
             revoked,
             name.size() > 1,
             Date{77}},
            base::toData(ticket)};
}

class MigrationTest : public testing::Test {
  protected:
    void SetUp() override {
        if (const auto reason = PostgresCluster::missing()) GTEST_SKIP() << *reason;
        service_ = test::makeService(directory_, "service");
        SqliteStore store(ServiceDirectory::open(service_).storePath());
        const Occasion occasion{Date{100}, "tester", Reason::compromised, "why \xc3", false};
        store.put(kProduction, {makeRecord("a", "first"), makeRecord("bb", std::string(70'000, 'x'))},
                  occasion);
        store.put(kProduction, {makeRecord("a", "second", true)}, occasion);
        store.put(Environment::development, {makeRecord("c", "third")}, occasion);
        store.noteRefusal({kProduction, ""}, occasion);
    }

    ServiceDirectory directory() const { return ServiceDirectory::open(service_); }
    std::string descriptionPath() const { return service_ + "/service/service.json"; }
    std::string description() const { return readFile(descriptionPath()); }

    /// One line, 78, and an unchanged description.
    void expectRefused(std::vector<std::string> arguments, const std::string& part) const {
        const std::string before = description();
        const ProcessResult result = test::runLumora(std::move(arguments));
        EXPECT_EQ(result.exitStatus, 78) << result.errors;
        EXPECT_EQ(result.output, "");
        EXPECT_EQ(std::count(result.errors.begin(), result.errors.end(), '\n'), 1) << result.errors;
        EXPECT_NE(result.errors.find(part), std::string::npos) << result.errors;
        EXPECT_EQ(description(), before);
    }

    void describe(const std::string& more) const {
        writeFile(descriptionPath(), "{\"hosts\":[\"127.0.0.1\"]," + more + "}\n");
    }

    const TemporaryDirectory directory_;
    std::string service_;
};

TEST_F(MigrationTest, CopiesAllAndNamesTheDatabase) {
    SqliteStore old(directory().storePath());
    const std::string url = PostgresCluster::shared().makeDatabase();
    const std::string before = description();
    const Migration migration = migrate(directory(), url);
    EXPECT_EQ(migration.records, 3U);
    EXPECT_EQ(migration.events, 5U);
    EXPECT_EQ(readFile(migration.oldDescription), before);
    EXPECT_EQ(directory().storeUrl(), url);
    const std::unique_ptr<RecordStore> store = openStore(directory());
    EXPECT_EQ(summarize(*store), summarize(old));
    EXPECT_EQ(verifyHistory(*store, migration.head).events, 5U);
    EXPECT_EQ(store->countRecords(), 3U);
    // The chain continues.
    store->put(kProduction, {makeRecord("d", "fourth")}, {Date{200}, "tester", std::nullopt, "", false});
    EXPECT_EQ(verifyHistory(*store, migration.head).events, 6U);
}

TEST_F(MigrationTest, DisablesTheOldStore) {
    const std::unique_ptr<RecordStore> old = openStore(directory());
    EXPECT_TRUE(old->findTicket(kProduction, "a"));
    migrate(directory(), PostgresCluster::shared().makeDatabase());
    EXPECT_THROW(old->findTicket(kProduction, "a"), Failure);
    EXPECT_THROW(old->put(kProduction, {makeRecord("d", "lost")}, {}), Failure);
    SqliteStore left(directory().storePath());
    EXPECT_FALSE(left.find(kProduction, "d"));
}

TEST_F(MigrationTest, RefusesADatabaseWithOtherContents) {
    const std::string url = PostgresCluster::shared().makeDatabase();
    PostgresCluster& cluster = PostgresCluster::shared();
    migrate(directory(), url);
    cluster.sql(url, "UPDATE lumora.record SET label = 'other' WHERE name = 'a'");
    describe(R"("server":{"key":"server.key","certificate":"server.pem"})");
    const ProcessResult refused = test::runLumora({"migrate", service_, "--to", url});
    EXPECT_EQ(refused.exitStatus, 73) << refused.errors;
    EXPECT_EQ(directory().storeUrl(), std::nullopt);
}

TEST_F(MigrationTest, CanBeRepeatedIfOnlyTheDescriptionIsUnchanged) {
    const std::string url = PostgresCluster::shared().makeDatabase();
    migrate(directory(), url);
    describe(R"("server":{"key":"server.key","certificate":"server.pem"})");
    EXPECT_EQ(migrate(directory(), url).records, 3U);
    EXPECT_EQ(directory().storeUrl(), url);
}

TEST_F(MigrationTest, RefusesABrokenLog) {
    const std::string path = directory().storePath();
    const std::string url = PostgresCluster::shared().makeDatabase();
    {
        SqliteStore store(path);
        store.put(kProduction, {makeRecord("d", "later")}, {Date{200}, "tester", std::nullopt, "", false});
    }
    SQLite::Database(path, SQLite::OPEN_READWRITE).exec("UPDATE record SET ticket = x'00' WHERE name = 'd'");
    expectRefused({"migrate", service_, "--to", url}, "the log does not fit the record d");
    EXPECT_EQ(
        PostgresCluster::shared().sql(url, "SELECT count(*) FROM pg_namespace WHERE nspname = 'lumora'"),
        "0\n");
}

TEST_F(MigrationTest, IsWholeOrAbsentAfterAKillAtAnyMoment) {
    if (const auto reason = test::cannotTrace()) GTEST_SKIP() << *reason;
    constexpr int kStep = 23;
    constexpr int kMoreCallsThanItMakes = 100'000;
    const std::string before = description();
    SqliteStore old(directory().storePath());
    const ContentsSummary wanted = summarize(old);
    int done = 0;
    for (int call = 1;; call += kStep) {
        ASSERT_LT(call, kMoreCallsThanItMakes);
        const std::string url = PostgresCluster::shared().makeDatabase();
        writeFile(descriptionPath(), before);
        const test::KilledChild child = test::runAndKillAt(
            call, [] {}, [&] { migrate(directory(), url); });
        ASSERT_TRUE(!child.reachedTheEnd || child.acknowledged) << child.said;
        if (description() == before) {
            EXPECT_FALSE(child.acknowledged) << "at call " << call;
        } else {
            ++done;
            EXPECT_EQ(directory().storeUrl(), url) << "at call " << call;
            EXPECT_EQ(summarize(*openStore(directory())), wanted) << "at call " << call;
        }
        if (child.reachedTheEnd) break;
        // The other half is done by running it again.
        writeFile(descriptionPath(), before);
        EXPECT_EQ(migrate(directory(), url).records, wanted.records) << "at call " << call;
    }
    EXPECT_GT(done, 0);
}

TEST_F(MigrationTest, ReportsAMismatchInOneLine) {
    const std::string place = "service.json: \"store\"";
    const std::vector<std::vector<std::string>> commands{{"list", service_},
                                                         {"log", service_},
                                                         {"issue", service_, "--record", kRecord},
                                                         {"revoke", service_, kRecord},
                                                         {"serve", service_, "--listen", "127.0.0.1:0"}};
    for (const auto& command : commands) {
        describe("\"store\":\"mysql://db/lumora\"");
        expectRefused(command, place + " is not a URL");
        describe("\"store\":5");
        expectRefused(command, place + " is not a URL");
        describe("\"store\":\"postgresql:///lumora?host=/nowhere/at/all\"");
        expectRefused(command, "/nowhere/at/all");
        expectRefused(command, place);
        describe("\"store\":\"postgresql://127.0.0.1:1/lumora\"");
        expectRefused(command, "127.0.0.1");
        describe("\"role\":\"boss\"");
        expectRefused(command, "service.json: \"role\" is boss");
        describe("\"role\":null");
        expectRefused(command, "service.json: \"role\"");
    }
    describe(R"("server":{"key":"server.key","certificate":"server.pem"})");
    expectRefused({"migrate", service_, "--to", "postgresql:///lumora?host=/nowhere/at/all"}, "--to: ");
    expectRefused({"migrate", service_, "--to", "mysql://db/lumora"}, "--to is not a URL");
}

TEST_F(MigrationTest, RefusesAServiceForLookups) {
    describe("\"role\":\"lookup\"");
    expectRefused({"issue", service_, "--record", kRecord}, "\"role\" is lookup");
    expectRefused({"revoke", service_, "a"}, "\"role\" is lookup");
    expectRefused({"migrate", service_, "--to", "postgresql:///x"}, "\"role\" is lookup");
    EXPECT_EQ(test::runLumora({"list", service_}).exitStatus, 0);
    EXPECT_THROW(openStore(directory())->put(kProduction, {makeRecord("d", "t")}, {}), Failure);
    const test::ServingInstance instance(service_);
    EXPECT_GT(instance.port(), 0);
}

TEST_F(MigrationTest, StopsLookupsOfARunningServiceUntilItsRestart) {
    const test::ServingInstance instance(service_);
    EXPECT_EQ(test::healthOf(service_, instance.port()), 200);
    migrate(directory(), PostgresCluster::shared().makeDatabase());
    EXPECT_EQ(test::healthOf(service_, instance.port()), 503);
    const test::ServingInstance again(service_);
    EXPECT_EQ(test::healthOf(service_, again.port()), 200);
}

}  // namespace
}  // namespace pinwell::lumora
