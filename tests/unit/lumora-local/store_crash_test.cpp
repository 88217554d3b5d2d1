// The contents of a store after its writer was killed, at each of its system calls.
#include <gtest/gtest.h>

#include <functional>
#include <memory>

#include "killed_child.h"
#include "lumora-local/event.h"
#include "sample_record.h"
#include "store_kinds.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using test::kProduction;
using values::Date;

constexpr int kMoreCallsThanAChangeMakes = 5000;

SignedRecord statedRecord(const std::string& name, bool revoked) {
    Data hash = base::toData(name);  // different for each record: none gets around a revoked one
    hash.resize(20);
    return {{name, "Sample.app", {{2, hash}}, revoked, false, Date{7}},
            base::toData(revoked ? "revoked" : "valid")};
}

class StoreCrashTest : public testing::TestWithParam<std::string> {
  protected:
    void SetUp() override {
        if (const auto reason = test::whyMissing(GetParam())) GTEST_SKIP() << *reason;
        if (const auto reason = test::cannotTrace()) GTEST_SKIP() << *reason;
        kind_ = test::makeStoreKind(GetParam());
    }

    void put(const SignedRecord& record) {
        kind_->open({})->put(kProduction, {record}, {Date{100}, "tester", Reason::compromised, "", false});
    }

    /// Puts a record in a child that is killed at that call.
    test::KilledChild putAndKillAt(int call, const SignedRecord& record) {
        std::unique_ptr<RecordStore> store;
        const test::KilledChild child = test::runAndKillAt(
            call, [&] { store = kind_->open({}); },
            [&] {
                store->put(kProduction, {record}, {Date{100}, "tester", Reason::compromised, "", false});
            });
        // A server may still work on a commit after its client has gone.
        kind_->open({})->holdStill([](const std::function<void()>&) {});
        return child;
    }

    std::unique_ptr<test::StoreKind> kind_;
};

INSTANTIATE_TEST_SUITE_P(In, StoreCrashTest, testing::Values("Sqlite", "Postgres"),
                         [](const auto& parameter) { return parameter.param; });

TEST_P(StoreCrashTest, KeepsEveryAcknowledgedIssue) {
    const std::unique_ptr<RecordStore> store = kind_->open({});
    std::size_t there = 0;
    int call = 1;
    for (bool ended = false; !ended; ++call) {
        ASSERT_LT(call, kMoreCallsThanAChangeMakes);
        const std::string name = "record-" + std::to_string(call);
        const test::KilledChild child = putAndKillAt(call, statedRecord(name, false));
        ended = child.reachedTheEnd;
        ASSERT_TRUE(!ended || child.acknowledged) << child.said;
        const bool found = store->findTicket(kProduction, name).has_value();
        EXPECT_TRUE(found || !child.acknowledged) << "lost at call " << call;
        there += found ? std::size_t{1} : std::size_t{0};
        // A record and its event arrive together or not at all.
        ASSERT_EQ(verifyHistory(*store, std::nullopt).events, there) << "at call " << call;
        ASSERT_EQ(store->countRecords(), there) << "at call " << call;
    }
    EXPECT_GT(call, 10);
    RecordProperty("calls", call);
}

TEST_P(StoreCrashTest, KeepsEveryAcknowledgedRevocation) {
    const std::unique_ptr<RecordStore> store = kind_->open({});
    std::size_t events = 0;
    for (int call = 1, ended = 0; ended == 0; ++call) {
        ASSERT_LT(call, kMoreCallsThanAChangeMakes);
        const std::string name = "record-" + std::to_string(call);
        put(statedRecord(name, false));
        const test::KilledChild child = putAndKillAt(call, statedRecord(name, true));
        ended = child.reachedTheEnd ? 1 : 0;
        ASSERT_TRUE(ended == 0 || child.acknowledged) << child.said;
        const auto record = store->find(kProduction, name);
        ASSERT_TRUE(record) << "gone at call " << call;
        EXPECT_TRUE(record->revoked || !child.acknowledged) << "lost at call " << call;
        events += record->revoked ? std::size_t{2} : std::size_t{1};
        ASSERT_EQ(verifyHistory(*store, std::nullopt).events, events) << "at call " << call;
    }
}

}  // namespace
}  // namespace pinwell::lumora
