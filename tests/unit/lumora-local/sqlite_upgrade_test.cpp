#include <SQLiteCpp/SQLiteCpp.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <thread>
#include <vector>

#include "lumora-local/event.h"
#include "lumora-local/failure.h"
#include "lumora-local/sqlite_store.h"
#include "support/temporary_directory.h"

namespace pinwell::lumora {
namespace {

using pinwell::test::TemporaryDirectory;
using values::Date;

/// A store as version 1 of the schema has it: records, and no events.
class SqliteUpgradeTest : public testing::Test {
  protected:
    SqliteUpgradeTest() {
        SQLite::Database database(path_, SQLite::OPEN_READWRITE | SQLite::OPEN_CREATE);
        database.exec("PRAGMA journal_mode = WAL");
        database.exec(R"(
            CREATE TABLE record (environment TEXT NOT NULL, name TEXT NOT NULL, label TEXT NOT NULL,
                revoked INTEGER NOT NULL, signed_at INTEGER NOT NULL, asset TEXT, ticket BLOB NOT NULL,
                PRIMARY KEY (environment, name));
            CREATE INDEX record_by_asset ON record (asset) WHERE asset IS NOT NULL;
            CREATE TABLE hash (environment TEXT NOT NULL, name TEXT NOT NULL, position INTEGER NOT NULL,
                algorithm INTEGER NOT NULL, hash BLOB NOT NULL, PRIMARY KEY (environment, name, position),
                FOREIGN KEY (environment, name) REFERENCES record (environment, name) ON DELETE CASCADE);
            INSERT INTO record VALUES ('production', 'late', 'Late.app', 1, 200, NULL, x'02');
            INSERT INTO record VALUES ('development', 'early', 'Early.app', 0, 100, NULL, x'01');
            PRAGMA user_version = 1;
        )");
    }

    static int versionAt(const std::string& path) {
        SQLite::Database database(path, SQLite::OPEN_READONLY);
        return database.execAndGet("PRAGMA user_version").getInt();
    }

    const TemporaryDirectory directory_;
    const std::string path_ = directory_ / "records.sqlite";
    const std::string copy_ = path_ + ".version-1";
};

TEST_F(SqliteUpgradeTest, KeepsTheRecords) {
    SqliteStore store(path_);
    EXPECT_EQ(store.countRecords(), 2U);
    EXPECT_TRUE(store.find(Environment::production, "late")->revoked);
}

TEST_F(SqliteUpgradeTest, LogsTheStateOfTheRecords) {
    SqliteStore store(path_);
    std::vector<Event> events;
    store.forEachEvent({}, [&](const Event& event) { events.push_back(event); });
    ASSERT_EQ(events.size(), 2U);
    EXPECT_EQ(events[0].record, "early");
    EXPECT_EQ(events[0].environment, Environment::development);
    EXPECT_EQ(events[0].action, Action::issued);
    EXPECT_EQ(events[0].time, Date{100});
    EXPECT_EQ(events[1].record, "late");
    EXPECT_EQ(events[1].action, Action::revoked);
    EXPECT_EQ(verifyHistory(store, std::nullopt).events, 2U);
}

TEST_F(SqliteUpgradeTest, KeepsACopyReadableOnlyByItsOwner) {
    { const SqliteStore store(path_); }
    EXPECT_EQ(versionAt(path_), 3);
    EXPECT_EQ(versionAt(copy_), 1);
    SQLite::Database copy(copy_, SQLite::OPEN_READONLY);
    EXPECT_EQ(copy.execAndGet("SELECT count(*) FROM record").getInt(), 2);
    EXPECT_EQ(std::filesystem::status(copy_).permissions(),
              std::filesystem::perms::owner_read | std::filesystem::perms::owner_write);
}

TEST_F(SqliteUpgradeTest, OverwritesNoEarlierCopy) {
    pinwell::test::writeFile(copy_, "something else");
    { const SqliteStore store(path_); }
    EXPECT_EQ(std::filesystem::file_size(copy_), 14U);
    EXPECT_EQ(versionAt(copy_ + ".2"), 1);
}

TEST_F(SqliteUpgradeTest, RunsOnceIfManyOpenTheStore) {
    std::vector<std::thread> openers;
    for (int i = 0; i < 4; ++i) openers.emplace_back([&] { const SqliteStore store(path_); });
    for (std::thread& opener : openers) opener.join();
    SqliteStore store(path_);
    EXPECT_EQ(verifyHistory(store, std::nullopt).events, 2U);
    EXPECT_FALSE(std::filesystem::exists(copy_ + ".2"));
}

TEST_F(SqliteUpgradeTest, CountsTheRecordsOfAStoreWithoutACount) {
    { const SqliteStore store(path_); }
    SQLite::Database(path_, SQLite::OPEN_READWRITE)
        .exec(
            "DROP TRIGGER record_is_added; DROP TRIGGER record_is_removed; DROP TABLE record_count;"
            "DROP TABLE request; DROP INDEX record_by_label; DROP INDEX event_by_time;"
            "PRAGMA user_version = 2");
    std::vector<std::thread> openers;
    for (int i = 0; i < 4; ++i) openers.emplace_back([&] { const SqliteStore store(path_); });
    for (std::thread& opener : openers) opener.join();
    EXPECT_EQ(SqliteStore(path_).countRecords(), 2U);
    EXPECT_FALSE(std::filesystem::exists(path_ + ".version-2.2"));
}

TEST_F(SqliteUpgradeTest, CountsChangesOfEarlierPrograms) {
    SqliteStore store(path_);
    SQLite::Database(path_, SQLite::OPEN_READWRITE)
        .exec(
            "DELETE FROM record WHERE name = 'early';"
            "INSERT INTO record VALUES ('production', 'a', 'A', 0, 1, NULL, x'01');"
            "INSERT INTO record VALUES ('production', 'b', 'B', 0, 1, NULL, x'01')");
    EXPECT_EQ(store.countRecords(), 3U);
}

TEST_F(SqliteUpgradeTest, UpgradesAStoreWithEventsWithoutANewEvent) {
    SQLite::Database(path_, SQLite::OPEN_READWRITE).exec(R"(
        CREATE TABLE event (position INTEGER PRIMARY KEY AUTOINCREMENT, time INTEGER NOT NULL,
            actor TEXT NOT NULL, action TEXT NOT NULL, environment TEXT NOT NULL, record TEXT NOT NULL,
            label TEXT NOT NULL, reason TEXT, comment TEXT NOT NULL, ticket TEXT NOT NULL,
            previous TEXT NOT NULL UNIQUE, hash TEXT NOT NULL UNIQUE);
        CREATE INDEX event_by_record ON event (environment, record, position);
        CREATE INDEX hash_by_bytes ON hash (environment, hash);
        PRAGMA user_version = 2;
    )");
    SqliteStore store(path_);
    EXPECT_EQ(versionAt(path_), 3);
    EXPECT_EQ(versionAt(path_ + ".version-2"), 2);
    EXPECT_EQ(store.headHash(), hashBeforeTheFirstEvent());
    RecordSearch search;
    search.label = "Late";
    search.limit = 10;
    ASSERT_EQ(store.search(search).records.size(), 1U);
    EXPECT_TRUE(store.search(search).records.front().record.revoked);
}

TEST_F(SqliteUpgradeTest, RefusesALaterVersion) {
    SQLite::Database(path_, SQLite::OPEN_READWRITE).exec("PRAGMA user_version = 4");
    EXPECT_THROW(const SqliteStore store(path_), Failure);
    EXPECT_EQ(versionAt(path_), 4);
}

}  // namespace
}  // namespace pinwell::lumora
