#include "lumora-local/sqlite_store.h"

#include <SQLiteCpp/SQLiteCpp.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <atomic>
#include <thread>

#include "lumora-local/failure.h"
#include "lumora-local/sha256.h"
#include "support/temporary_directory.h"

namespace pinwell::lumora {
namespace {

using foundation::Data;
using foundation::Date;
using pinwell::test::TemporaryDirectory;
using pinwell::test::writeFile;

constexpr Environment kProduction = Environment::production;

const Occasion kOccasion{Date{100}, "tester", std::nullopt, "", false};

SignedRecord makeRecord(const std::string& name, std::string_view ticket) {
    return {{name,
             "Sample.app",
             {{2, Data(20, std::byte{1})}, {4, Data(48, std::byte{2})}},
             false,
             false,
             Date{77}},
            foundation::toData(ticket)};
}

class SqliteStoreTest : public testing::Test {
  protected:
    SqliteStoreTest() { SqliteStore::create(path_); }

    const TemporaryDirectory directory_;
    const std::string path_ = directory_ / "records.sqlite";
};

TEST_F(SqliteStoreTest, DeliversATicketInline) {
    SqliteStore store(path_);
    store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    const auto delivery = store.findTicket(kProduction, "a");
    ASSERT_TRUE(delivery);
    EXPECT_EQ(delivery->inlineTicket, foundation::toData("ticket"));
    EXPECT_FALSE(delivery->asset);
}

TEST_F(SqliteStoreTest, DeliversATicketAsAnAsset) {
    SqliteStore store(path_);
    SignedRecord record = makeRecord("a", "ticket");
    record.record.asAsset = true;
    store.put(kProduction, {record}, kOccasion);
    const auto delivery = store.findTicket(kProduction, "a");
    ASSERT_TRUE(delivery && delivery->asset);
    EXPECT_FALSE(delivery->inlineTicket);
    EXPECT_EQ(delivery->asset->size, 6U);
    EXPECT_EQ(delivery->asset->identifier, foundation::toHex(sha256(foundation::toData("ticket"))));
    EXPECT_EQ(store.findAsset(delivery->asset->identifier), foundation::toData("ticket"));
}

TEST_F(SqliteStoreTest, HasNoAssetForAnInlineTicket) {
    SqliteStore store(path_);
    store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    EXPECT_EQ(store.findAsset(foundation::toHex(sha256(foundation::toData("ticket")))), std::nullopt);
}

TEST_F(SqliteStoreTest, WithdrawsTheAssetOfAReplacedRecord) {
    SqliteStore store(path_);
    SignedRecord record = makeRecord("a", "ticket");
    record.record.asAsset = true;
    store.put(kProduction, {record}, kOccasion);
    const std::string identifier = store.findTicket(kProduction, "a")->asset->identifier;
    store.put(kProduction, {makeRecord("a", "another")}, kOccasion);
    EXPECT_EQ(store.findAsset(identifier), std::nullopt);
    EXPECT_EQ(store.findTicket(kProduction, "a")->inlineTicket, foundation::toData("another"));
}

TEST_F(SqliteStoreTest, KnowsNothingOfOtherNames) {
    SqliteStore store(path_);
    store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    EXPECT_FALSE(store.findTicket(kProduction, "A"));
    EXPECT_FALSE(store.findTicket(kProduction, ""));
    EXPECT_FALSE(store.findTicket(kProduction, "a' OR '1'='1"));
    EXPECT_FALSE(store.findTicket(kProduction, std::string("a\0", 2)));
}

TEST_F(SqliteStoreTest, KeepsTheEnvironmentsApart) {
    SqliteStore store(path_);
    store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    EXPECT_FALSE(store.findTicket(Environment::development, "a"));
    EXPECT_TRUE(store.list(Environment::development).empty());
}

TEST_F(SqliteStoreTest, RemembersAllOfARecord) {
    SqliteStore store(path_);
    SignedRecord entry = makeRecord("a", "ticket");
    entry.record.revoked = true;
    store.put(kProduction, {entry}, kOccasion);
    const auto record = store.find(kProduction, "a");
    ASSERT_TRUE(record);
    EXPECT_EQ(record->label, "Sample.app");
    EXPECT_EQ(record->hashes, entry.record.hashes);
    EXPECT_TRUE(record->revoked);
    EXPECT_EQ(record->signedAt, Date{77});
    EXPECT_FALSE(store.find(kProduction, "b"));
}

TEST_F(SqliteStoreTest, ListsByName) {
    SqliteStore store(path_);
    store.put(kProduction, {makeRecord("b", "1"), makeRecord("a", "2")}, kOccasion);
    const auto records = store.list(kProduction);
    ASSERT_EQ(records.size(), 2U);
    EXPECT_EQ(records[0].name, "a");
    EXPECT_EQ(records[1].name, "b");
    EXPECT_EQ(store.countRecords(), 2U);
}

TEST_F(SqliteStoreTest, PutsAllOrNone) {
    SqliteStore store(path_);
    SignedRecord broken = makeRecord("b", "");
    broken.ticket.clear();  // a blob of no bytes is bound as NULL, which the store does not take
    EXPECT_THROW(store.put(kProduction, {makeRecord("a", "ticket"), broken}, kOccasion), Failure);
    EXPECT_FALSE(store.findTicket(kProduction, "a"));
}

SignedRecord revokedRecord(const std::string& name) {
    SignedRecord entry = makeRecord(name, "revoked ticket");
    entry.record.revoked = true;
    return entry;
}

std::vector<Event> eventsOf(RecordStore& store, const EventQuery& query = {}) {
    std::vector<Event> events;
    store.forEachEvent(query, [&](const Event& event) { events.push_back(event); });
    return events;
}

TEST_F(SqliteStoreTest, LogsWhatHappensToARecord) {
    SqliteStore store(path_);
    store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    store.put(kProduction, {makeRecord("a", "ticket 2")}, kOccasion);
    store.put(kProduction, {revokedRecord("a")},
              {Date{200}, "auditor", Reason::compromised, "key lost", false});
    store.put(kProduction, {makeRecord("a", "ticket 3")}, {Date{300}, "boss", std::nullopt, "found", true});
    const std::vector<Event> events = eventsOf(store);
    ASSERT_EQ(events.size(), 4U);
    EXPECT_EQ(events[0].action, Action::issued);
    EXPECT_EQ(events[1].action, Action::reissued);
    EXPECT_EQ(events[2].action, Action::revoked);
    EXPECT_EQ(events[3].action, Action::reinstated);
    EXPECT_EQ(events[2].time, Date{200});
    EXPECT_EQ(events[2].actor, "auditor");
    EXPECT_EQ(events[2].reason, Reason::compromised);
    EXPECT_EQ(events[2].comment, "key lost");
    EXPECT_EQ(events[2].label, "Sample.app");
    EXPECT_EQ(events[2].ticket, foundation::toHex(sha256(foundation::toData("revoked ticket"))));
    EXPECT_EQ(events[0].previous, hashBeforeTheFirstEvent());
    EXPECT_EQ(events[3].previous, events[2].hash);
    EXPECT_EQ(events[3].hash, hashOf(events[3]));
    EXPECT_EQ(store.headHash(), events[3].hash);
}

TEST_F(SqliteStoreTest, HasAHeadWithoutEvents) {
    EXPECT_EQ(SqliteStore(path_).headHash(), hashBeforeTheFirstEvent());
}

TEST_F(SqliteStoreTest, SelectsEventsByRecordAndTime) {
    SqliteStore store(path_);
    store.put(kProduction, {makeRecord("a", "1"), makeRecord("b", "2")}, kOccasion);
    store.put(kProduction, {makeRecord("a", "3")}, {Date{200}, "tester", std::nullopt, "", false});
    EXPECT_EQ(eventsOf(store, {"a", std::nullopt}).size(), 2U);
    EXPECT_EQ(eventsOf(store, {std::nullopt, Date{101}}).size(), 1U);
    EXPECT_EQ(eventsOf(store, {std::nullopt, Date{100}}).size(), 3U);
    EXPECT_EQ(eventsOf(store, {"b", Date{101}}).size(), 0U);
}

TEST_F(SqliteStoreTest, RefusesAValidTicketForARevokedRecord) {
    SqliteStore store(path_);
    store.put(kProduction, {revokedRecord("a")}, kOccasion);
    try {
        store.put(kProduction, {makeRecord("b", "ticket"), makeRecord("a", "ticket")}, kOccasion);
        FAIL() << "a revoked record became valid";
    } catch (const Failure& failure) {
        EXPECT_EQ(failure.exitStatus(), EX_DATAERR);
        EXPECT_NE(std::string(failure.what()).find("record a "), std::string::npos) << failure.what();
    }
    EXPECT_TRUE(store.find(kProduction, "a")->revoked);
    EXPECT_FALSE(store.find(kProduction, "b"));
    EXPECT_EQ(eventsOf(store).size(), 1U);
}

SignedRecord listing(const std::string& name, std::initializer_list<std::uint8_t> hashes) {
    SignedRecord entry = makeRecord(name, "ticket");
    entry.record.hashes.clear();
    for (const std::uint8_t fill : hashes)
        entry.record.hashes.push_back({2, Data(20, static_cast<std::byte>(fill))});
    return entry;
}

TEST_F(SqliteStoreTest, RefusesATicketForARevokedHashUnderAnotherName) {
    SqliteStore store(path_);
    SignedRecord revoked = listing("2/2/a", {1, 2});
    revoked.record.revoked = true;
    store.put(kProduction, {revoked}, kOccasion);
    SignedRecord sameBytes = listing("2/3/a", {1});
    sameBytes.record.hashes.front().algorithm = 3;
    EXPECT_THROW(store.put(kProduction, {sameBytes}, kOccasion), Failure);
    // A slice of what was revoked, and something that holds it.
    EXPECT_THROW(store.put(kProduction, {listing("2/2/b", {2})}, kOccasion), Failure);
    EXPECT_THROW(store.put(kProduction, {listing("2/2/c", {3, 1})}, kOccasion), Failure);
    EXPECT_EQ(eventsOf(store).size(), 1U);
}

TEST_F(SqliteStoreTest, IssuesWhatSharesNestedCodeWithARevokedRecord) {
    SqliteStore store(path_);
    SignedRecord revoked = listing("2/2/a", {1, 2});
    revoked.record.revoked = true;
    store.put(kProduction, {revoked}, kOccasion);
    EXPECT_NO_THROW(store.put(kProduction, {listing("2/2/b", {3, 2})}, kOccasion));
    EXPECT_NO_THROW(store.put(Environment::development, {listing("2/3/a", {1})}, kOccasion));
}

TEST_F(SqliteStoreTest, ReinstatesARevokedHashUnderAnotherNameIfTold) {
    SqliteStore store(path_);
    SignedRecord revoked = listing("2/2/a", {1});
    revoked.record.revoked = true;
    store.put(kProduction, {revoked}, kOccasion);
    EXPECT_NO_THROW(
        store.put(kProduction, {listing("2/3/a", {1})}, {Date{300}, "boss", std::nullopt, "found", true}));
}

TEST_F(SqliteStoreTest, RefusesItAlsoIfTheRevocationComesFromAnotherConnection) {
    SqliteStore store(path_);
    store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    SqliteStore(path_).put(kProduction, {revokedRecord("a")}, kOccasion);
    EXPECT_THROW(store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion), Failure);
}

TEST_F(SqliteStoreTest, RevokesInOneEnvironmentAlone) {
    SqliteStore store(path_);
    store.put(kProduction, {revokedRecord("a")}, kOccasion);
    EXPECT_NO_THROW(store.put(Environment::development, {makeRecord("a", "ticket")}, kOccasion));
}

TEST_F(SqliteStoreTest, NeverChangesOrRemovesEvents) {
    SqliteStore(path_).put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    SQLite::Database database(path_, SQLite::OPEN_READWRITE);
    EXPECT_THROW(database.exec("UPDATE event SET comment = 'x'"), SQLite::Exception);
    EXPECT_THROW(database.exec("DELETE FROM event"), SQLite::Exception);
}

TEST_F(SqliteStoreTest, ShowsAnOpenReaderWhatAnotherConnectionWrites) {
    SqliteStore reader(path_);
    EXPECT_FALSE(reader.findTicket(kProduction, "a"));
    SqliteStore(path_).put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    EXPECT_TRUE(reader.findTicket(kProduction, "a"));
}

TEST_F(SqliteStoreTest, LetsWritersTakeTurns) {
    constexpr int kWriters = 4;
    constexpr int kRecordsEach = 10;
    std::vector<std::thread> writers;
    for (int writer = 0; writer < kWriters; ++writer) {
        writers.emplace_back([this, writer] {
            SqliteStore store(path_);
            for (int i = 0; i < kRecordsEach; ++i) {
                store.put(kProduction,
                          {makeRecord(std::to_string(writer) + "-" + std::to_string(i), "ticket")},
                          kOccasion);
            }
        });
    }
    for (std::thread& writer : writers) writer.join();
    EXPECT_EQ(SqliteStore(path_).countRecords(), std::size_t{kWriters * kRecordsEach});
}

TEST_F(SqliteStoreTest, MayBeUsedFromSeveralThreads) {
    SqliteStore store(path_);
    store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    std::vector<std::thread> readers;
    std::atomic<int> found{0};
    for (int reader = 0; reader < 4; ++reader) {
        readers.emplace_back([&] {
            for (int i = 0; i < 50; ++i) found += store.findTicket(kProduction, "a") ? 1 : 0;
        });
    }
    for (std::thread& reader : readers) reader.join();
    EXPECT_EQ(found, 200);
}

TEST_F(SqliteStoreTest, IsReadableByItsOwnerAlone) {
    struct stat status {};
    ASSERT_EQ(::stat(path_.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777U, 0600U);
}

TEST_F(SqliteStoreTest, IsNotMadeOverAnotherFile) {
    EXPECT_THROW(SqliteStore::create(path_), Failure);
}

TEST_F(SqliteStoreTest, RefusesWhatIsNotAStore) {
    writeFile(directory_ / "garbage",
              "this is no database, and long enough that nobody could mistake it for one");
    writeFile(directory_ / "empty", "");
    EXPECT_THROW(SqliteStore(directory_ / "garbage"), Failure);
    EXPECT_THROW(SqliteStore(directory_ / "empty"), Failure);
    EXPECT_THROW(SqliteStore(directory_ / "missing"), Failure);
}

}  // namespace
}  // namespace pinwell::lumora
