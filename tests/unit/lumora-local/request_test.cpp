// Repeated requests and refused attempts, in every store.
#include <gtest/gtest.h>

#include <atomic>
#include <thread>

#include "lumora-local/event.h"
#include "sample_record.h"
#include "store_kinds.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using test::kProduction;
using test::makeRecord;
using values::Date;

class RequestTest : public test::EveryStoreTest {
  protected:
    static Occasion occasionOf(const std::string& key, const std::string& digest, std::int64_t time = 100) {
        Occasion occasion{Date{time}, "ci", std::nullopt, "", false};
        occasion.request = RequestIdentity{"ci", key, digest};
        return occasion;
    }

    PutOutcome put(const std::string& ticket, const Occasion& occasion) {
        return store().put(kProduction, {makeRecord("a", ticket)}, occasion);
    }

    std::vector<Event> events() {
        std::vector<Event> all;
        store().forEachEvent({}, [&](const Event& event) { all.push_back(event); });
        return all;
    }
};

INSTANTIATE_TEST_SUITE_P(In, RequestTest, test::everyStore(), test::nameOfStore);

TEST_P(RequestTest, ChangesNothingWhenRepeated) {
    const PutOutcome first = put("first", occasionOf("k", "d"));
    EXPECT_FALSE(first.earlier);
    const PutOutcome again = put("second", occasionOf("k", "d", 200));
    EXPECT_EQ(again.event.hash, first.event.hash);
    EXPECT_EQ(again.event.action, Action::issued);
    EXPECT_EQ(again.earlier, base::toData("first"));
    EXPECT_EQ(events().size(), 1U);
    EXPECT_EQ(store().findTicket(kProduction, "a")->inlineTicket, base::toData("first"));
}

TEST_P(RequestTest, KeepsItsTicketWhenTheRecordGetsAnother) {
    put("first", occasionOf("k", "d"));
    put("second", occasionOf("l", "e"));
    EXPECT_EQ(put("third", occasionOf("k", "d")).earlier, base::toData("first"));
    EXPECT_EQ(store().findTicket(kProduction, "a")->inlineTicket, base::toData("second"));
}

TEST_P(RequestTest, IsKnownToOtherInstances) {
    put("first", occasionOf("k", "d"));
    EXPECT_TRUE(open()->put(kProduction, {makeRecord("a", "x")}, occasionOf("k", "d")).earlier);
}

TEST_P(RequestTest, IsRefusedUnderTheKeyOfAnother) {
    put("first", occasionOf("k", "d"));
    EXPECT_THROW(put("second", occasionOf("k", "e")), ReusedKeyFailure);
    EXPECT_EQ(events().size(), 1U);
}

TEST_P(RequestTest, HasAKeyThatIsUniqueOnlyForItsClient) {
    put("first", occasionOf("k", "d"));
    Occasion other = occasionOf("k", "e");
    other.request->client = "someone else";
    EXPECT_FALSE(put("second", other).earlier);
    EXPECT_EQ(events().size(), 2U);
}

TEST_P(RequestTest, IsForgottenAfterItsLife) {
    put("first", occasionOf("k", "d", 100));
    EXPECT_TRUE(put("x", occasionOf("k", "d", 100 + kRequestLife - 1)).earlier);
    EXPECT_FALSE(put("second", occasionOf("k", "e", 100 + kRequestLife)).earlier);
    EXPECT_TRUE(put("x", occasionOf("k", "e", 100 + kRequestLife + 1)).earlier);
}

TEST_P(RequestTest, LeavesNoTraceIfItIsRefused) {
    SignedRecord revoked = makeRecord("a", "revoked");
    revoked.record.revoked = true;
    store().put(kProduction, {revoked}, test::kOccasion);
    EXPECT_THROW(put("valid", occasionOf("k", "d")), RevokedFailure);
    Occasion reinstating = occasionOf("k", "e");
    reinstating.reinstates = true;
    EXPECT_EQ(put("valid", reinstating).event.action, Action::reinstated);
}

TEST_P(RequestTest, IsCarriedOutOnceByTwoConcurrentInstances) {
    const auto other = open();
    std::vector<std::thread> threads;
    std::atomic<int> first{0};
    for (RecordStore* instance : {&store(), other.get()}) {
        threads.emplace_back([&first, instance] {
            for (int i = 0; i < 5; ++i) {
                const PutOutcome outcome = instance->put(kProduction, {makeRecord("a", "x")},
                                                         occasionOf("k" + std::to_string(i), "d"));
                if (!outcome.earlier) ++first;
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(first, 5);
    EXPECT_EQ(events().size(), 5U);
}

TEST_P(RequestTest, LogsARefusedAttemptInTheChain) {
    put("first", occasionOf("k", "d"));
    store().noteRefusal({kProduction, "a"}, {Date{300}, "intruder", std::nullopt, "403: no role", false});
    store().noteRefusal({kProduction, ""}, {Date{301}, "intruder", std::nullopt, "400: no JSON", false});
    const std::vector<Event> all = events();
    ASSERT_EQ(all.size(), 3U);
    EXPECT_EQ(all[1].action, Action::refused);
    EXPECT_EQ(all[1].actor, "intruder");
    EXPECT_EQ(all[1].record, "a");
    EXPECT_EQ(all[1].comment, "403: no role");
    EXPECT_EQ(all[1].ticket, "");
    EXPECT_EQ(all[2].record, "");
    EXPECT_EQ(all[2].previous, all[1].hash);
}

TEST_P(RequestTest, KeepsTheLogConsistentAfterARefusedAttempt) {
    put("first", occasionOf("k", "d"));
    store().noteRefusal({kProduction, "a"}, {Date{300}, "intruder", std::nullopt, "", false});
    EXPECT_EQ(verifyHistory(store(), std::nullopt).events, 2U);
    EXPECT_EQ(put("second", occasionOf("l", "d")).event.action, Action::reissued);
    EXPECT_EQ(verifyHistory(store(), std::nullopt).events, 3U);
}

}  // namespace
}  // namespace pinwell::lumora
