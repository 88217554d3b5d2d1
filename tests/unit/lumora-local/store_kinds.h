// All kinds of record stores, each empty and in its own place, for tests with the same requirements on all of
// them.
#pragma once

#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "lumora-local/record_store.h"

namespace pinwell::lumora::test {

/// An empty store, which can be opened many times.
class StoreKind {
  public:
    virtual ~StoreKind() = default;
    virtual std::unique_ptr<RecordStore> open(StoreGuard guard) = 0;
};

/// `kind` is "Sqlite" or "Postgres".
std::unique_ptr<StoreKind> makeStoreKind(const std::string& kind);

/// Why that kind cannot be tested here; `nullopt` if it can.
std::optional<std::string> whyMissing(const std::string& kind);

/// Tests of every kind of store; each test has an empty one.
class EveryStoreTest : public testing::TestWithParam<std::string> {
  protected:
    void SetUp() override {
        if (const auto reason = whyMissing(GetParam())) GTEST_SKIP() << *reason;
        kind_ = makeStoreKind(GetParam());
    }

    /// The same store, opened once more.
    std::unique_ptr<RecordStore> open(StoreGuard guard = {}) { return kind_->open(std::move(guard)); }

    /// Closed after the test.
    RecordStore& openAndKeep(StoreGuard guard = {}) {
        kept_.push_back(open(std::move(guard)));
        return *kept_.back();
    }

    /// The store of tests that need it once.
    RecordStore& store() { return kept_.empty() ? openAndKeep() : *kept_.front(); }

  private:
    std::unique_ptr<StoreKind> kind_;
    std::vector<std::unique_ptr<RecordStore>> kept_;
};

/// For INSTANTIATE_TEST_SUITE_P: all kinds, and the name of each in test names.
inline auto everyStore() {
    return testing::Values("Sqlite", "Postgres");
}
inline std::string nameOfStore(const testing::TestParamInfo<std::string>& parameter) {
    return parameter.param;
}

}  // namespace pinwell::lumora::test
