// Tests for PostgreSQL only: servers that are down, hang, follow another one, or have other contents.
#include "lumora-local/postgres_store.h"

#include <gtest/gtest.h>

#include <thread>

#include "commit_cutter.h"
#include "lumora-local/event.h"
#include "lumora-local/failure.h"
#include "lumora-local/postgres_pool.h"
#include "postgres_cluster.h"
#include "sample_record.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using test::CommitCutter;
using test::kOccasion;
using test::kProduction;
using test::makeRecord;
using test::PostgresCluster;
using values::Date;

PostgresPlace placeOf(const std::string& url) {
    return {.url = url, .named = "service.json: \"store\""};
}

/// Runs it, and returns the failure with which it ended.
template <class Work>
Failure failureOf(Work&& work) {
    try {
        work();
    } catch (const Failure& failure) {
        return failure;
    }
    ADD_FAILURE() << "nothing failed";
    return {0, ""};
}

void expectRefused(const PostgresPlace& place, const std::string& part) {
    const Failure failure = failureOf([&] { PostgresStore store(place); });
    EXPECT_EQ(failure.exitStatus(), EX_CONFIG);
    const std::string text = failure.what();
    EXPECT_TRUE(text.starts_with("service.json: \"store\": ")) << text;
    EXPECT_NE(text.find(part), std::string::npos) << text;
    EXPECT_EQ(text.find('\n'), std::string::npos) << text;
}

class PostgresStoreTest : public testing::Test {
  protected:
    void SetUp() override {
        if (const auto reason = PostgresCluster::missing()) GTEST_SKIP() << *reason;
    }
};

TEST_F(PostgresStoreTest, NamesAnUnreachableServer) {
    expectRefused(placeOf("postgresql:///lumora?host=/nowhere/at/all&user=x"), "/nowhere/at/all");
    expectRefused(placeOf("postgresql://127.0.0.1:1/lumora?user=x"), "127.0.0.1");
}

TEST_F(PostgresStoreTest, RefusesAMissingDatabase) {
    expectRefused(placeOf(PostgresCluster::shared().url("nosuch")), "\"nosuch\" does not exist");
}

TEST_F(PostgresStoreTest, RefusesADatabaseWithoutAStore) {
    expectRefused(placeOf(PostgresCluster::shared().makeDatabase()), "has no record store");
}

TEST_F(PostgresStoreTest, RefusesAnotherEncoding) {
    const std::string url = PostgresCluster::shared().makeDatabase("ENCODING 'SQL_ASCII' TEMPLATE template0");
    expectRefused(placeOf(url), "encoding is SQL_ASCII");
    EXPECT_EQ(failureOf([&] { PostgresStore::create(placeOf(url)); }).exitStatus(), EX_CONFIG);
}

TEST_F(PostgresStoreTest, RefusesAnUnknownVersion) {
    PostgresCluster& cluster = PostgresCluster::shared();
    const std::string url = cluster.makeDatabase();
    PostgresStore::create(placeOf(url));
    cluster.sql(url, "UPDATE lumora.store SET version = 999");
    expectRefused(placeOf(url), "version 999");
    EXPECT_EQ(cluster.sql(url, "SELECT version FROM lumora.store"), "999\n");
}

TEST_F(PostgresStoreTest, UpgradesAnEarlierVersion) {
    PostgresCluster& cluster = PostgresCluster::shared();
    const std::string url = cluster.makeDatabase();
    cluster.sql(url,
                "CREATE SCHEMA lumora; CREATE TABLE lumora.store (only_row boolean PRIMARY KEY DEFAULT true,"
                " version integer NOT NULL, records bigint NOT NULL);"
                " INSERT INTO lumora.store (version, records) VALUES (0, 0)");
    PostgresPlace place = placeOf(url);
    place.forLookups = true;
    expectRefused(place, "record store of version 0");
    PostgresStore(placeOf(url)).put(kProduction, {makeRecord("a")}, kOccasion);
    EXPECT_EQ(PostgresStore(place).countRecords(), 1U);
}

TEST_F(PostgresStoreTest, UpgradesRecordsAndEvents) {
    PostgresCluster& cluster = PostgresCluster::shared();
    const std::string url = cluster.makeDatabase();
    PostgresStore::create(placeOf(url));
    PostgresStore(placeOf(url)).put(kProduction, {makeRecord("a")}, kOccasion);
    cluster.sql(url,
                "SET search_path = lumora; DROP TABLE request; DROP INDEX record_by_label;"
                " DROP INDEX event_by_time; UPDATE store SET version = 1");
    PostgresStore store(placeOf(url));
    RecordSearch search;
    search.label = "Sample";
    search.limit = 1;
    EXPECT_EQ(store.search(search).records.size(), 1U);
    EXPECT_EQ(verifyHistory(store, std::nullopt).events, 1U);
    EXPECT_EQ(cluster.sql(url, "SELECT version FROM lumora.store"), "2\n");
}

TEST_F(PostgresStoreTest, StopsAfterAnotherProgramHasUpgradedIt) {
    PostgresCluster& cluster = PostgresCluster::shared();
    const std::string url = cluster.makeDatabase();
    PostgresStore::create(placeOf(url));
    PostgresStore store(placeOf(url));
    cluster.sql(url, "UPDATE lumora.store SET version = 3");
    EXPECT_EQ(failureOf([&] { store.put(kProduction, {makeRecord("a")}, kOccasion); }).exitStatus(),
              EX_CONFIG);
    EXPECT_EQ(store.headHash(), hashBeforeTheFirstEvent());
}

TEST_F(PostgresStoreTest, IsNotMadeOverAnotherStore) {
    const std::string url = PostgresCluster::shared().makeDatabase();
    PostgresStore::create(placeOf(url));
    EXPECT_NO_THROW(PostgresStore::create(placeOf(url)));  // it is empty
    PostgresStore(placeOf(url)).put(kProduction, {makeRecord("a")}, kOccasion);
    EXPECT_EQ(failureOf([&] { PostgresStore::create(placeOf(url)); }).exitStatus(), EX_CANTCREAT);
    EXPECT_EQ(PostgresStore(placeOf(url)).countRecords(), 1U);
}

TEST_F(PostgresStoreTest, LeavesNothingIfFillingFails) {
    PostgresCluster& cluster = PostgresCluster::shared();
    const std::string url = cluster.makeDatabase();
    EXPECT_THROW(PostgresStore::create(placeOf(url),
                                       [](const ContentsVisitor& visitor) {
                                           visitor.record(kProduction, makeRecord("a"));
                                           throw Failure(EX_IOERR, "the source is gone");
                                       }),
                 Failure);
    EXPECT_EQ(cluster.sql(url, "SELECT count(*) FROM pg_namespace WHERE nspname = 'lumora'"), "0\n");
}

TEST_F(PostgresStoreTest, NeverChangesOrRemovesEvents) {
    PostgresCluster& cluster = PostgresCluster::shared();
    const std::string url = cluster.makeDatabase();
    PostgresStore::create(placeOf(url));
    PostgresStore(placeOf(url)).put(kProduction, {makeRecord("a")}, kOccasion);
    for (const char* statement :
         {"UPDATE lumora.event SET comment = 'x'", "DELETE FROM lumora.event", "TRUNCATE lumora.event"}) {
        EXPECT_THROW(cluster.sql(url, statement), std::runtime_error) << statement;
    }
}

TEST_F(PostgresStoreTest, CommitsToTheDiskDespiteTheServersDefaults) {
    PostgresCluster& cluster = PostgresCluster::shared();
    const std::string url = cluster.makeDatabase();
    PostgresStore::create(placeOf(url));
    PostgresConnection connection(url + "&options=-csynchronous_commit%3Doff",
                                  std::chrono::steady_clock::now() + std::chrono::seconds(30));
    const PostgresRows rows = connection.query("SELECT current_setting('synchronous_commit')", {},
                                               std::chrono::steady_clock::now() + std::chrono::seconds(30));
    EXPECT_EQ(rows.text(0, 0), "on");
}

TEST_F(PostgresStoreTest, DerivesItsNeedsFromTheUrl) {
    EXPECT_FALSE(postgresNeeds("postgresql:///lumora?host=/run/postgresql", "url").tcp);
    EXPECT_TRUE(postgresNeeds("postgresql://db.example/lumora", "url").tcp);
    EXPECT_TRUE(postgresNeeds("postgresql:///lumora?host=/run,db.example", "url").tcp);
    const auto files = postgresNeeds("postgresql://db/lumora?sslrootcert=/etc/root.pem", "url").files;
    EXPECT_NE(std::find(files.begin(), files.end(), "/etc/root.pem"), files.end());
    const Failure failure = failureOf([] { postgresNeeds("postgresql://u:secret%@db", "service.json"); });
    EXPECT_EQ(failure.exitStatus(), EX_CONFIG);
    EXPECT_EQ(std::string(failure.what()).find("secret"), std::string::npos) << failure.what();
}

/// A cluster that these tests may end.
class LostDatabase : public PostgresStoreTest {
  protected:
    void SetUp() override {
        PostgresStoreTest::SetUp();
        if (IsSkipped()) return;
        cluster_ = std::make_unique<PostgresCluster>();
        place_ = placeOf(cluster_->makeDatabase());
        PostgresStore::create(place_);
    }

    std::unique_ptr<PostgresCluster> cluster_;
    PostgresPlace place_;
};

TEST_F(LostDatabase, FailsOnlyTheCallsThatNeedIt) {
    PostgresStore store(place_);
    store.put(kProduction, {makeRecord("a")}, kOccasion);
    cluster_->stopImmediately();
    EXPECT_EQ(failureOf([&] { store.findTicket(kProduction, "a"); }).exitStatus(), EX_TEMPFAIL);
    EXPECT_EQ(failureOf([&] { store.put(kProduction, {makeRecord("b")}, kOccasion); }).exitStatus(),
              EX_TEMPFAIL);
    cluster_->start();
    EXPECT_TRUE(store.findTicket(kProduction, "a"));
    EXPECT_FALSE(store.findTicket(kProduction, "b"));
}

TEST_F(LostDatabase, IsUnnoticedAfterItsReturn) {
    PostgresStore store(place_);
    store.put(kProduction, {makeRecord("a")}, kOccasion);
    cluster_->stopImmediately();
    cluster_->start();
    EXPECT_TRUE(store.findTicket(kProduction, "a"));
    cluster_->stopImmediately();
    cluster_->start();
    EXPECT_EQ(store.list(kProduction).size(), 1U);
    cluster_->stopImmediately();
    cluster_->start();
    EXPECT_NO_THROW(store.put(kProduction, {makeRecord("b")}, kOccasion));
    EXPECT_EQ(verifyHistory(store, std::nullopt).events, 2U);
}

TEST_F(LostDatabase, IsWaitedForABoundedTimeIfItHangs) {
    PostgresStore store(place_);
    store.put(kProduction, {makeRecord("a")}, kOccasion);
    cluster_->sql(place_.url, "SELECT 1");
    std::thread holder([&] {
        // Simulates a server that does not respond: the table is locked for longer than any wait.
        cluster_->sql(place_.url, "BEGIN; LOCK TABLE lumora.record; SELECT pg_sleep(8)");
    });
    while (cluster_->sql(place_.url,
                         "SELECT count(*) FROM pg_locks WHERE mode = 'AccessExclusiveLock'"
                         " AND granted AND relation = 'lumora.record'::regclass") != "1\n") {
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
    EXPECT_EQ(failureOf([&] { store.findTicket(kProduction, "a"); }).exitStatus(), EX_TEMPFAIL);
    holder.join();
    EXPECT_TRUE(store.findTicket(kProduction, "a"));
}

TEST_F(LostDatabase, LeavesLookupsToAReplica) {
    PostgresStore primary(place_);
    primary.put(kProduction, {makeRecord("a")}, kOccasion);
    PostgresCluster replica(PostgresCluster::ReplicaOf{*cluster_});
    PostgresPlace place = placeOf(replica.url(place_.url.substr(14, place_.url.find('?') - 14)));
    expectRefused(place, "is a replica");
    place.forLookups = true;
    PostgresStore store(place);
    EXPECT_TRUE(store.findTicket(kProduction, "a"));
    primary.put(kProduction, {makeRecord("b")}, kOccasion);
    while (!store.findTicket(kProduction, "b")) std::this_thread::sleep_for(std::chrono::milliseconds(20));
    EXPECT_THROW(store.put(kProduction, {makeRecord("c")}, kOccasion), Failure);
}

/// A store whose commits get lost.
class DoubtfulCommit : public PostgresStoreTest {
  protected:
    void SetUp() override {
        PostgresStoreTest::SetUp();
        if (IsSkipped()) return;
        PostgresCluster& cluster = PostgresCluster::shared();
        cutter_ = std::make_unique<CommitCutter>(cluster.socketDirectory());
        std::string url = cluster.makeDatabase();
        PostgresStore::create(placeOf(url));
        url.replace(url.find(cluster.socketDirectory()), cluster.socketDirectory().size(),
                    cutter_->directory());
        place_ = placeOf(url);
    }

    void expectOneEvent(PostgresStore& store) {
        EXPECT_EQ(cutter_->cuts(), 1);
        EXPECT_EQ(verifyHistory(store, std::nullopt).events, 1U);
        EXPECT_EQ(store.countRecords(), 1U);
    }

    std::unique_ptr<CommitCutter> cutter_;
    PostgresPlace place_;
};

TEST_F(DoubtfulCommit, IsRepeatedIfTheServerDidNotReceiveIt) {
    PostgresStore store(place_);
    cutter_->cut(CommitCutter::Cut::commit);
    EXPECT_NO_THROW(store.put(kProduction, {makeRecord("a")}, kOccasion));
    expectOneEvent(store);
}

TEST_F(DoubtfulCommit, IsNotRepeatedIfTheServerHasIt) {
    PostgresStore store(place_);
    cutter_->cut(CommitCutter::Cut::answer);
    EXPECT_NO_THROW(store.put(kProduction, {makeRecord("a")}, kOccasion));
    expectOneEvent(store);
}

TEST_F(DoubtfulCommit, IsWaitedForABoundedTimeIfTheServerFallsSilent) {
    PostgresStore store(place_);
    EXPECT_FALSE(store.findTicket(kProduction, "a"));
    cutter_->cut(CommitCutter::Cut::all);
    EXPECT_EQ(failureOf([&] { store.findTicket(kProduction, "a"); }).exitStatus(), EX_TEMPFAIL);
    EXPECT_EQ(failureOf([&] { store.put(kProduction, {makeRecord("a")}, kOccasion); }).exitStatus(),
              EX_TEMPFAIL);
    expectRefused(place_, "does not answer in time");
    cutter_->cut(CommitCutter::Cut::nothing);
    EXPECT_NO_THROW(store.put(kProduction, {makeRecord("a")}, kOccasion));
}

}  // namespace
}  // namespace pinwell::lumora
