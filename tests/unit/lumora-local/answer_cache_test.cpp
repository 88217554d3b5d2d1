#include "lumora-local/answer_cache.h"

#include <gtest/gtest.h>

#include <atomic>
#include <thread>

#include "base/text.h"
#include "lumora-local/lookup.h"
#include "lumora-local/sqlite_store.h"
#include "support/temporary_directory.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using pinwell::test::TemporaryDirectory;

std::shared_ptr<const KeptAnswer> kept(const std::string& contents) {
    return std::make_shared<const KeptAnswer>(KeptAnswer{contents});
}

constexpr Environment kProduction = Environment::production;

TEST(AnswerCache, ReturnsItsEntriesForTheSameState) {
    AnswerCache cache;
    cache.insert(7, kProduction, "name", kept("record"));
    ASSERT_NE(cache.find(7, kProduction, "name"), nullptr);
    EXPECT_EQ(cache.find(7, kProduction, "name")->text, "record");
    EXPECT_EQ(cache.find(7, Environment::development, "name"), nullptr);
    EXPECT_EQ(cache.find(7, kProduction, "other"), nullptr);
}

TEST(AnswerCache, IsEmptyInALaterState) {
    AnswerCache cache;
    cache.insert(7, kProduction, "name", kept("record"));
    EXPECT_EQ(cache.find(8, kProduction, "name"), nullptr);
    EXPECT_EQ(cache.count(), 0U);
    EXPECT_EQ(cache.bytes(), 0U);
}

TEST(AnswerCache, RefusesEntriesReadBeforeAChange) {
    AnswerCache cache;
    EXPECT_EQ(cache.find(8, kProduction, "name"), nullptr);
    cache.insert(7, kProduction, "name", kept("of an earlier state"));
    EXPECT_EQ(cache.find(8, kProduction, "name"), nullptr);
    cache.insert(8, kProduction, "name", kept("now"));
    EXPECT_EQ(cache.find(7, kProduction, "name"), nullptr) << "whoever asked before the change reads again";
    EXPECT_EQ(cache.find(8, kProduction, "name")->text, "now");
}

TEST(AnswerCache, IsBoundedInEntries) {
    AnswerCache cache({.entries = 3, .bytes = 1'000'000});
    for (const char* name : {"a", "b", "c"}) cache.insert(1, kProduction, name, kept("x"));
    cache.find(1, kProduction, "a");
    cache.insert(1, kProduction, "d", kept("x"));
    EXPECT_EQ(cache.count(), 3U);
    EXPECT_EQ(cache.find(1, kProduction, "b"), nullptr) << "it was used longest ago";
    EXPECT_NE(cache.find(1, kProduction, "a"), nullptr);
}

TEST(AnswerCache, IsBoundedInBytes) {
    AnswerCache cache({.entries = 1'000'000, .bytes = 10'000});
    for (int i = 0; i < 1000; ++i) {
        cache.insert(1, kProduction, std::to_string(i), kept(std::string(90, 'x')));
        ASSERT_LE(cache.bytes(), 10'000U);
    }
    EXPECT_GT(cache.count(), 90U);
    cache.insert(1, kProduction, "large", kept(std::string(101, 'x')));
    EXPECT_EQ(cache.find(1, kProduction, "large"), nullptr) << "it would drive out all others";
}

/// Lookups over one connection to a store, and changes over another, as from another process.
class CachedLookups : public testing::Test {
  protected:
    CachedLookups() { SqliteStore::create(path_); }

    static SignedRecord record(int fill, int ticket, bool revoked = false) {
        const CodeHash hash{2, Data(20, static_cast<std::byte>(fill))};
        return {{recordName(hash), "label", {hash}, revoked, false, values::Date::now()},
                base::toData("ticket " + std::to_string(ticket))};
    }

    static void put(SqliteStore& store, const SignedRecord& record) {
        Occasion occasion;
        occasion.actor = "tester";
        occasion.reinstates = true;
        store.put(kProduction, {record}, occasion);
    }

    /// The ticket that a lookup delivers; empty if there is none.
    static std::string ticketOf(const LookupService& lookups, const std::string& name) {
        const RequestHead head{"POST",
                               "/database/1/com.ostrel.tm.ticket-delivery/production/public/records/lookup",
                               "localhost", "application/json", ""};
        const Answer answer = lookups.answerLookup(head, R"({"records":[{"recordName":")" + name + R"("}]})");
        const auto document = values::parseJSON(base::asBytes(answer.body));
        const auto& value = (*document)["records"][0]["fields"]["signedTicket"]["value"];
        if (value.string() == nullptr) return "";
        return base::toString(*base::decodeBase64(*value.string()));
    }

    const TemporaryDirectory directory_;
    const std::string path_ = directory_ / "records";
};

TEST_F(CachedLookups, SeeChangesOfOtherConnections) {
    SqliteStore serving(path_);
    SqliteStore other(path_);
    const LookupService lookups(serving, {"localhost"}, {"localhost", 8443});
    const std::string name = record(1, 0).record.name;
    EXPECT_EQ(ticketOf(lookups, name), "");
    for (int i = 1; i < 20; ++i) {
        put(i % 2 == 0 ? other : serving, record(1, i, i % 3 == 0));
        EXPECT_EQ(ticketOf(lookups, name), "ticket " + std::to_string(i));
        EXPECT_EQ(ticketOf(lookups, name), "ticket " + std::to_string(i)) << "out of the cache";
    }
}

TEST_F(CachedLookups, NeverReturnAStateOlderThanAnAcknowledgedChange) {
    SqliteStore serving(path_);
    const LookupService lookups(serving, {"localhost"}, {"localhost", 8443});
    const std::string name = record(1, 0).record.name;
    put(serving, record(1, 0));
    std::atomic<int> acknowledged{0};
    std::atomic<int> stale{0};
    std::atomic<int> answers{0};
    constexpr int kChanges = 60;
    std::vector<std::thread> readers;
    for (int reader = 0; reader < 3; ++reader) {
        readers.emplace_back([&] {
            while (acknowledged < kChanges) {
                const int before = acknowledged;
                const std::string ticket = ticketOf(lookups, name);
                if (std::stoi(ticket.substr(ticket.find(' '))) < before) ++stale;
                ++answers;
            }
        });
    }
    SqliteStore writing(path_);
    for (int i = 1; i <= kChanges; ++i) {
        put(writing, record(1, i, i % 2 == 0));
        acknowledged = i;
    }
    for (std::thread& reader : readers) reader.join();
    EXPECT_EQ(stale, 0);
    EXPECT_GT(answers, 0);
}

TEST_F(CachedLookups, KeepTheStateNumberWithoutChanges) {
    SqliteStore serving(path_);
    SqliteStore other(path_);
    const auto first = serving.changeCounter();
    ASSERT_TRUE(first);
    static_cast<void>(other.countRecords());
    EXPECT_EQ(serving.changeCounter(), first);
    put(other, record(1, 1));
    const auto second = serving.changeCounter();
    EXPECT_GT(*second, *first);
    put(serving, record(2, 2));
    EXPECT_GT(*serving.changeCounter(), *second);
}

}  // namespace
}  // namespace pinwell::lumora
