#include "lumora-local/event.h"

#include <SQLiteCpp/SQLiteCpp.h>
#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include "lumora-local/failure.h"
#include "lumora-local/sqlite_store.h"
#include "support/temporary_directory.h"

namespace pinwell::lumora {
namespace {

using pinwell::test::TemporaryDirectory;
using values::Date;

class HistoryTest : public testing::Test {
  protected:
    HistoryTest() {
        SqliteStore::create(path_);
        SqliteStore store(path_);
        for (const char* name : {"a", "b", "c"}) put(store, name, false);
        put(store, "b", true);
    }

    static void put(RecordStore& store, const std::string& name, bool revoked) {
        SignedRecord entry;
        entry.record.name = name;
        entry.record.label = name;
        entry.record.revoked = revoked;
        entry.ticket = base::toData(name);
        store.put(Environment::production, {entry}, {Date{77}, "tester", std::nullopt, "", false});
    }

    /// Changes the database without the program.
    void tamper(const std::string& sql) {
        SQLite::Database database(path_, SQLite::OPEN_READWRITE);
        database.exec("DROP TRIGGER IF EXISTS event_is_not_changed");
        database.exec("DROP TRIGGER IF EXISTS event_is_not_removed");
        database.exec(sql);
    }

    /// Why the check fails; empty if it does not.
    std::string complaint(const std::optional<std::string>& knownHead = std::nullopt) {
        try {
            SqliteStore store(path_);
            verifyHistory(store, knownHead);
        } catch (const Failure& failure) {
            EXPECT_EQ(failure.exitStatus(), EX_CONFIG);
            return failure.what();
        }
        return "";
    }

    const TemporaryDirectory directory_;
    const std::string path_ = directory_ / "records.sqlite";
};

TEST_F(HistoryTest, AcceptsAnUnchangedLog) {
    SqliteStore store(path_);
    const HistorySummary summary = verifyHistory(store, store.headHash());
    EXPECT_EQ(summary.events, 4U);
    EXPECT_EQ(summary.head, store.headHash());
}

TEST_F(HistoryTest, DetectsAChangedEvent) {
    for (const char* change :
         {"comment = 'x'", "time = 78", "actor = 'x'", "action = 'reissued'", "label = 'x'",
          "reason = 'withdrawn'", "ticket = 'x'", "environment = 'development'"}) {
        tamper("UPDATE event SET " + std::string(change) + " WHERE position = 4");
        EXPECT_NE(complaint().find("event 4 "), std::string::npos) << change << ": " << complaint();
    }
}

TEST_F(HistoryTest, DetectsARemovedEvent) {
    tamper("DELETE FROM event WHERE position = 2");
    EXPECT_NE(complaint().find("event 2 "), std::string::npos) << complaint();
    EXPECT_NE(complaint().find("does not follow"), std::string::npos) << complaint();
}

TEST_F(HistoryTest, DetectsEventsInAnotherOrder) {
    tamper("UPDATE event SET position = position + 10 WHERE position = 1");
    EXPECT_NE(complaint().find("event 1 "), std::string::npos) << complaint();
}

TEST_F(HistoryTest, DetectsACutEndByAKnownHead) {
    const std::string head = SqliteStore(path_).headHash();
    tamper("DELETE FROM event WHERE position = 4; DELETE FROM record WHERE name = 'b'");
    EXPECT_EQ(complaint(), "");
    EXPECT_NE(complaint(head).find(head), std::string::npos);
}

TEST_F(HistoryTest, AcceptsEveryEarlierHead) {
    SqliteStore store(path_);
    const std::string head = store.headHash();
    put(store, "d", false);
    EXPECT_EQ(complaint(head), "");
    EXPECT_EQ(complaint(hashBeforeTheFirstEvent()), "");
}

TEST_F(HistoryTest, DetectsARecordWithAnotherTicketThanItsEvent) {
    tamper("UPDATE record SET ticket = x'00' WHERE name = 'a'");
    EXPECT_NE(complaint().find("record a "), std::string::npos) << complaint();
}

TEST_F(HistoryTest, DetectsARevokedRecordThatWasMadeValid) {
    tamper("UPDATE record SET revoked = 0 WHERE name = 'b'");
    EXPECT_NE(complaint().find("record b "), std::string::npos) << complaint();
}

TEST_F(HistoryTest, DetectsARecordWithoutAnEvent) {
    tamper("INSERT INTO record VALUES ('production', 'z', 'z', 0, 0, NULL, x'00')");
    EXPECT_NE(complaint().find("record z "), std::string::npos) << complaint();
}

TEST_F(HistoryTest, NamesAnUnknownAction) {
    tamper("UPDATE event SET action = 'blessed' WHERE position = 1");
    EXPECT_NE(complaint().find("blessed"), std::string::npos);
}

TEST_F(HistoryTest, IsOneDocumentAsJson) {
    SqliteStore store(path_);
    std::string text;
    writeEvents(store, {}, true, [&](std::string_view part) { text += part; });
    const auto document = nlohmann::json::parse(text);
    ASSERT_EQ(document["events"].size(), 4U);
    EXPECT_EQ(document["events"][3]["hash"], store.headHash());
    EXPECT_EQ(document["events"][3]["previous"], document["events"][2]["hash"]);
}

TEST_F(HistoryTest, IsOneJsonDocumentWithoutEvents) {
    SqliteStore store(path_);
    std::string text;
    writeEvents(store, {"nobody", std::nullopt}, true, [&](std::string_view part) { text += part; });
    EXPECT_EQ(text, "{\"events\":[]}\n");
}

}  // namespace
}  // namespace pinwell::lumora
