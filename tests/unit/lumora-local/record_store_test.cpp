// The behaviour of every record store, with any database.
#include "lumora-local/record_store.h"

#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <thread>

#include "base/text.h"
#include "crypto/crypto.h"
#include "lumora-local/event.h"
#include "lumora-local/failure.h"
#include "lumora-local/store_rules.h"
#include "sample_record.h"
#include "store_kinds.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using test::kOccasion;
using test::kProduction;
using test::makeRecord;
using values::Date;

class RecordStoreTest : public test::EveryStoreTest {};

INSTANTIATE_TEST_SUITE_P(In, RecordStoreTest, test::everyStore(), test::nameOfStore);

TEST_P(RecordStoreTest, DeliversATicketInline) {
    RecordStore& store = openAndKeep();
    store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    const auto delivery = store.findTicket(kProduction, "a");
    ASSERT_TRUE(delivery);
    EXPECT_EQ(delivery->inlineTicket, base::toData("ticket"));
    EXPECT_FALSE(delivery->asset);
}

TEST_P(RecordStoreTest, DeliversATicketAsAnAsset) {
    RecordStore& store = openAndKeep();
    SignedRecord record = makeRecord("a", "ticket");
    record.record.asAsset = true;
    store.put(kProduction, {record}, kOccasion);
    const auto delivery = store.findTicket(kProduction, "a");
    ASSERT_TRUE(delivery && delivery->asset);
    EXPECT_FALSE(delivery->inlineTicket);
    EXPECT_EQ(delivery->asset->size, 6U);
    EXPECT_EQ(delivery->asset->identifier, base::toHex(crypto::sha256(base::toData("ticket"))));
    EXPECT_EQ(store.findAsset(delivery->asset->identifier), base::toData("ticket"));
}

TEST_P(RecordStoreTest, HasNoAssetForAnInlineTicket) {
    RecordStore& store = openAndKeep();
    store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    EXPECT_EQ(store.findAsset(base::toHex(crypto::sha256(base::toData("ticket")))), std::nullopt);
}

TEST_P(RecordStoreTest, WithdrawsTheAssetOfAReplacedRecord) {
    RecordStore& store = openAndKeep();
    SignedRecord record = makeRecord("a", "ticket");
    record.record.asAsset = true;
    store.put(kProduction, {record}, kOccasion);
    const std::string identifier = store.findTicket(kProduction, "a")->asset->identifier;
    store.put(kProduction, {makeRecord("a", "another")}, kOccasion);
    EXPECT_EQ(store.findAsset(identifier), std::nullopt);
    EXPECT_EQ(store.findTicket(kProduction, "a")->inlineTicket, base::toData("another"));
}

TEST_P(RecordStoreTest, FindsNothingUnderOtherNames) {
    RecordStore& store = openAndKeep();
    store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    EXPECT_FALSE(store.findTicket(kProduction, "A"));
    EXPECT_FALSE(store.findTicket(kProduction, ""));
    EXPECT_FALSE(store.findTicket(kProduction, "a' OR '1'='1"));
    EXPECT_FALSE(store.findTicket(kProduction, std::string("a\0", 2)));
}

TEST_P(RecordStoreTest, KeepsTheEnvironmentsApart) {
    RecordStore& store = openAndKeep();
    store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    EXPECT_FALSE(store.findTicket(Environment::development, "a"));
    EXPECT_TRUE(store.list(Environment::development).empty());
}

TEST_P(RecordStoreTest, StoresAllMembersOfARecord) {
    RecordStore& store = openAndKeep();
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

TEST_P(RecordStoreTest, ListsByName) {
    RecordStore& store = openAndKeep();
    store.put(kProduction, {makeRecord("b", "1"), makeRecord("a", "2")}, kOccasion);
    const auto records = store.list(kProduction);
    ASSERT_EQ(records.size(), 2U);
    EXPECT_EQ(records[0].name, "a");
    EXPECT_EQ(records[1].name, "b");
    EXPECT_EQ(store.countRecords(), 2U);
}

TEST_P(RecordStoreTest, FindsManyTicketsInTheOrderOfTheirNames) {
    RecordStore& store = openAndKeep();
    SignedRecord asset = makeRecord("b", "second");
    asset.record.asAsset = true;
    store.put(kProduction, {makeRecord("a", "first"), asset}, kOccasion);
    store.put(Environment::development, {makeRecord("c", "elsewhere")}, kOccasion);
    const std::vector<std::string> names{"b",
                                         "c",
                                         "",
                                         "a",
                                         "b",
                                         "no\xff"
                                         "name",
                                         "{\"a\"}",
                                         "a\\"};
    const auto found = store.findTickets(kProduction, names);
    ASSERT_EQ(found.size(), names.size());
    ASSERT_TRUE(found[0] && found[0]->asset && found[4] && found[4]->asset);
    EXPECT_EQ(found[0]->asset->size, 6U);
    EXPECT_EQ(found[4]->asset->identifier, found[0]->asset->identifier);
    ASSERT_TRUE(found[3]);
    EXPECT_EQ(found[3]->inlineTicket, base::toData("first"));
    for (const std::size_t none : {1U, 2U, 5U, 6U, 7U}) EXPECT_FALSE(found[none]) << names[none];
    EXPECT_TRUE(store.findTickets(kProduction, {}).empty());
    EXPECT_TRUE(store.findTickets(kProduction, std::vector<std::string>{"a"}).front());
}

TEST_P(RecordStoreTest, CountsItsRecordsAndEvents) {
    RecordStore& store = openAndKeep();
    EXPECT_EQ(store.facts().records, 0U);
    EXPECT_EQ(store.facts().events, 0U);
    store.put(kProduction, {makeRecord("a", "1"), makeRecord("b", "2")}, kOccasion);
    store.put(Environment::development, {makeRecord("a", "3")}, kOccasion);
    open()->put(kProduction, {makeRecord("a", "4")}, kOccasion);  // replaces the first one
    EXPECT_EQ(store.facts().records, 3U);
    EXPECT_EQ(store.facts().events, 4U);
    EXPECT_EQ(store.countRecords(), 3U);
}

TEST_P(RecordStoreTest, PutsAllOrNone) {
    RecordStore& store = openAndKeep();
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

TEST_P(RecordStoreTest, LogsEachChangeOfARecord) {
    RecordStore& store = openAndKeep();
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
    EXPECT_EQ(events[2].ticket, base::toHex(crypto::sha256(base::toData("revoked ticket"))));
    EXPECT_EQ(events[0].previous, hashBeforeTheFirstEvent());
    EXPECT_EQ(events[3].previous, events[2].hash);
    EXPECT_EQ(events[3].hash, hashOf(events[3]));
    EXPECT_EQ(store.headHash(), events[3].hash);
}

TEST_P(RecordStoreTest, HasAHeadWithoutEvents) {
    EXPECT_EQ(open()->headHash(), hashBeforeTheFirstEvent());
}

TEST_P(RecordStoreTest, SelectsEventsByRecordAndTime) {
    RecordStore& store = openAndKeep();
    store.put(kProduction, {makeRecord("a", "1"), makeRecord("b", "2")}, kOccasion);
    store.put(kProduction, {makeRecord("a", "3")}, {Date{200}, "tester", std::nullopt, "", false});
    EXPECT_EQ(eventsOf(store, {"a", std::nullopt}).size(), 2U);
    EXPECT_EQ(eventsOf(store, {std::nullopt, Date{101}}).size(), 1U);
    EXPECT_EQ(eventsOf(store, {std::nullopt, Date{100}}).size(), 3U);
    EXPECT_EQ(eventsOf(store, {"b", Date{101}}).size(), 0U);
}

TEST_P(RecordStoreTest, RefusesAValidTicketForARevokedRecord) {
    RecordStore& store = openAndKeep();
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

TEST_P(RecordStoreTest, RefusesATicketForARevokedHashUnderAnotherName) {
    RecordStore& store = openAndKeep();
    SignedRecord revoked = listing("2/2/a", {1, 2});
    revoked.record.revoked = true;
    store.put(kProduction, {revoked}, kOccasion);
    SignedRecord sameBytes = listing("2/3/a", {1});
    sameBytes.record.hashes.front().algorithm = 3;
    EXPECT_THROW(store.put(kProduction, {sameBytes}, kOccasion), Failure);
    // A slice of the revoked artefact, and an artefact that contains it.
    EXPECT_THROW(store.put(kProduction, {listing("2/2/b", {2})}, kOccasion), Failure);
    EXPECT_THROW(store.put(kProduction, {listing("2/2/c", {3, 1})}, kOccasion), Failure);
    EXPECT_EQ(eventsOf(store).size(), 1U);
}

TEST_P(RecordStoreTest, IssuesForSoftwareThatSharesNestedCodeWithARevokedRecord) {
    RecordStore& store = openAndKeep();
    SignedRecord revoked = listing("2/2/a", {1, 2});
    revoked.record.revoked = true;
    store.put(kProduction, {revoked}, kOccasion);
    EXPECT_NO_THROW(store.put(kProduction, {listing("2/2/b", {3, 2})}, kOccasion));
}

const Occasion kReinstating{Date{300}, "boss", std::nullopt, "found", true};

TEST_P(RecordStoreTest, ReinstatesARevokedHashUnderAnotherNameOnRequest) {
    RecordStore& store = openAndKeep();
    SignedRecord revoked = listing("2/2/a", {1});
    revoked.record.revoked = true;
    store.put(kProduction, {revoked}, kOccasion);
    EXPECT_NO_THROW(store.put(kProduction, {listing("2/3/a", {1})}, kReinstating));
}

TEST_P(RecordStoreTest, RevokesTheHashesOfEarlierTicketsToo) {
    RecordStore& store = openAndKeep();
    store.put(kProduction, {listing("2/2/a", {1, 2})}, kOccasion);
    store.put(kProduction, {listing("2/2/a", {1})}, kOccasion);
    std::optional<Record> record = store.find(kProduction, "2/2/a");
    ASSERT_TRUE(record);
    EXPECT_EQ(record->hashes, listing("2/2/a", {1, 2}).record.hashes);
    SignedRecord revoked{*record, base::toData("ticket")};
    revoked.record.revoked = true;
    store.put(kProduction, {revoked}, kOccasion);
    EXPECT_THROW(store.put(kProduction, {listing("2/2/b", {2})}, kOccasion), RevokedFailure);

    // A ticket that is issued between the reading of a record and its revocation.
    store.put(kProduction, {listing("2/2/c", {3})}, kOccasion);
    SignedRecord late = listing("2/2/c", {3});
    late.record.revoked = true;
    store.put(kProduction, {listing("2/2/c", {3, 4})}, kOccasion);
    store.put(kProduction, {late}, kOccasion);
    EXPECT_THROW(store.put(kProduction, {listing("2/2/d", {4})}, kOccasion), RevokedFailure);
}

TEST(EarlierHashes, AreBounded) {
    const auto hashes = [](std::size_t from, std::size_t count) {
        std::vector<CodeHash> all;
        for (std::size_t i = from; i < from + count; ++i) {
            CodeHash hash{2, Data(20)};
            for (std::size_t byte = 0; byte < 4; ++byte)
                hash.hash[byte] = static_cast<std::byte>(i >> (8 * byte));
            all.push_back(std::move(hash));
        }
        return all;
    };
    Record record;
    record.hashes = hashes(0, 8);
    keepEarlierHashes(record, hashes(4, kMaximumKeptHashes - 4));
    EXPECT_EQ(record.hashes, hashes(0, kMaximumKeptHashes));
    EXPECT_THROW(keepEarlierHashes(record, hashes(kMaximumKeptHashes, 1)), TooManyHashesFailure);
    // A ticket alone is not refused for its size.
    Record large;
    large.hashes = hashes(0, kMaximumKeptHashes + 5);
    EXPECT_NO_THROW(keepEarlierHashes(large, hashes(0, 3)));
}

TEST_P(RecordStoreTest, LogsThatATicketReinstatesAHashThatAnotherRecordHasRevoked) {
    RecordStore& store = openAndKeep();
    SignedRecord revoked = listing("2/2/a", {1});
    revoked.record.revoked = true;
    store.put(kProduction, {revoked}, kOccasion);
    EXPECT_EQ(store.put(kProduction, {listing("2/3/a", {1})}, kReinstating).event.action, Action::reinstated);
    EXPECT_EQ(store.put(kProduction, {listing("2/2/b", {9})}, kReinstating).event.action, Action::issued);
}

TEST_P(RecordStoreTest, RefusesATicketThatAnotherConnectionHasRevoked) {
    RecordStore& store = openAndKeep();
    store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    open()->put(kProduction, {revokedRecord("a")}, kOccasion);
    EXPECT_THROW(store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion), Failure);
}

/// Clients of both environments accept a ticket of either.
TEST_P(RecordStoreTest, RefusesATicketOfDevelopmentForSoftwareRevokedInProduction) {
    RecordStore& store = openAndKeep();
    SignedRecord revoked = listing("2/2/a", {1, 2});
    revoked.record.revoked = true;
    store.put(kProduction, {revoked}, kOccasion);
    for (const SignedRecord& entry :
         {listing("2/2/a", {1, 2}), listing("2/3/a", {1}), listing("2/2/b", {2})}) {
        try {
            store.put(Environment::development, {entry}, kOccasion);
            FAIL() << entry.record.name << " became valid";
        } catch (const RevokedFailure& failure) {
            EXPECT_EQ(failure.revoked(), "2/2/a (production)");
        }
    }
    EXPECT_EQ(store.put(Environment::development, {listing("2/2/a", {1})}, kReinstating).event.action,
              Action::reinstated);
}

TEST_P(RecordStoreTest, RevokesInDevelopmentOnlyForDevelopment) {
    RecordStore& store = openAndKeep();
    store.put(Environment::development, {revokedRecord("a")}, kOccasion);
    EXPECT_NO_THROW(store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion));
    EXPECT_THROW(store.put(Environment::development, {makeRecord("a", "ticket")}, kOccasion), RevokedFailure);
}

TEST_P(RecordStoreTest, ShowsChangesOfOtherConnectionsToAnOpenReader) {
    RecordStore& reader = openAndKeep();
    EXPECT_FALSE(reader.findTicket(kProduction, "a"));
    open()->put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    EXPECT_TRUE(reader.findTicket(kProduction, "a"));
}

TEST_P(RecordStoreTest, SerialisesWriters) {
    constexpr int kWriters = 4;
    constexpr int kRecordsEach = 10;
    std::vector<std::thread> writers;
    for (int writer = 0; writer < kWriters; ++writer) {
        writers.emplace_back([this, writer] {
            const std::unique_ptr<RecordStore> store = open();
            for (int i = 0; i < kRecordsEach; ++i) {
                store->put(kProduction,
                           {makeRecord(std::to_string(writer) + "-" + std::to_string(i), "ticket")},
                           kOccasion);
            }
        });
    }
    for (std::thread& writer : writers) writer.join();
    EXPECT_EQ(open()->countRecords(), std::size_t{kWriters * kRecordsEach});
    EXPECT_EQ(verifyHistory(*open(), std::nullopt).events, std::size_t{kWriters * kRecordsEach});
}

TEST_P(RecordStoreTest, MayBeUsedFromSeveralThreads) {
    RecordStore& store = openAndKeep();
    store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    std::vector<std::thread> readers;
    std::atomic<int> found{0};
    for (int reader = 0; reader < 12; ++reader) {
        readers.emplace_back([&] {
            for (int i = 0; i < 50; ++i) found += store.findTicket(kProduction, "a") ? 1 : 0;
        });
    }
    for (std::thread& reader : readers) reader.join();
    EXPECT_EQ(found, 600);
}

TEST_P(RecordStoreTest, KeepsEveryByteOfTexts) {
    RecordStore& store = openAndKeep();
    const std::string bytes("a\xff\xc3\"\\{},NULL\n\0z", 16);
    SignedRecord entry = makeRecord("a", "ticket");
    entry.record.label = bytes;
    entry.ticket = base::toData(bytes);
    store.put(kProduction, {entry}, {Date{100}, bytes, std::nullopt, bytes, false});
    EXPECT_EQ(store.find(kProduction, "a")->label, bytes);
    EXPECT_EQ(store.findTicket(kProduction, "a")->inlineTicket, entry.ticket);
    EXPECT_EQ(eventsOf(store).at(0).actor, bytes);
    EXPECT_EQ(eventsOf(store).at(0).comment, bytes);
    EXPECT_NO_THROW(verifyHistory(store, std::nullopt));
}

TEST_P(RecordStoreTest, TakesTicketsOfManyHashesAndBytes) {
    RecordStore& store = openAndKeep();
    SignedRecord entry = makeRecord("a", "");
    entry.ticket = Data(5 * 1024 * 1024, std::byte{0x5c});
    entry.record.hashes.resize(3000, {1, Data(20, std::byte{9})});
    store.put(kProduction, {entry, makeRecord("b", "ticket")}, kOccasion);
    EXPECT_EQ(store.find(kProduction, "a")->hashes.size(), 3000U);
    EXPECT_EQ(store.findTicket(kProduction, "a")->inlineTicket, entry.ticket);
    EXPECT_EQ(verifyHistory(store, std::nullopt).events, 2U);
}

TEST_P(RecordStoreTest, WalksAllItsContents) {
    RecordStore& store = openAndKeep();
    SignedRecord asset = makeRecord("b", "second");
    asset.record.asAsset = true;
    store.put(Environment::development, {makeRecord("z", "third")}, kOccasion);
    store.put(kProduction, {asset, makeRecord("a", "first")}, kOccasion);
    std::vector<std::string> events;
    std::vector<std::string> records;
    store.walkContents({.event = [&](const Event& event) { events.push_back(event.record); },
                        .record =
                            [&](Environment environment, const SignedRecord& entry) {
                                EXPECT_EQ(entry.record.hashes, asset.record.hashes);
                                EXPECT_EQ(entry.record.asAsset, entry.record.name == "b");
                                records.push_back(std::string(toString(environment)) + " " +
                                                  entry.record.name + " " + base::toString(entry.ticket));
                            }});
    EXPECT_EQ(events, (std::vector<std::string>{"z", "b", "a"}));
    EXPECT_EQ(records,
              (std::vector<std::string>{"development z third", "production a first", "production b second"}));
}

TEST_P(RecordStoreTest, RefusesChangesWhileItIsHeldStill) {
    RecordStore& store = openAndKeep();
    std::thread writer;
    store.holdStill([&](const std::function<void()>& confirm) {
        writer = std::thread([this] { open()->put(kProduction, {makeRecord("a", "ticket")}, kOccasion); });
        for (int i = 0; i < 20; ++i) {
            EXPECT_EQ(store.countRecords(), 0U);
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        }
        EXPECT_NO_THROW(confirm());
    });
    writer.join();
    EXPECT_EQ(store.countRecords(), 1U);
}

TEST_P(RecordStoreTest, CallsItsGuardBeforeItReadsOrChanges) {
    std::atomic<bool> forbidden{false};
    RecordStore& store = openAndKeep([&](StoreUse use) {
        if (use == StoreUse::changing || forbidden) throw Failure(EX_CONFIG, "forbidden");
    });
    EXPECT_THROW(store.put(kProduction, {makeRecord("a", "ticket")}, kOccasion), Failure);
    EXPECT_EQ(store.countRecords(), 0U);
    EXPECT_TRUE(eventsOf(store).empty());
    forbidden = true;
    EXPECT_THROW(store.findTicket(kProduction, "a"), Failure);
    EXPECT_THROW(store.findAsset("a"), Failure);
    EXPECT_THROW(store.list(kProduction), Failure);
}

}  // namespace
}  // namespace pinwell::lumora
