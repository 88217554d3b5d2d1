// All kinds of record stores, each empty and in its own place, for tests with the same requirements on all of
// them.
#pragma once

#include <memory>
#include <optional>
#include <string>

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

}  // namespace pinwell::lumora::test
