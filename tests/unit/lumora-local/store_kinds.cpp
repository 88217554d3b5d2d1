#include "store_kinds.h"

#include "lumora-local/sqlite_store.h"
#include "support/temporary_directory.h"
#if PINWELL_LUMORA_POSTGRESQL
#include "lumora-local/postgres_store.h"
#include "postgres_cluster.h"
#endif

namespace pinwell::lumora::test {
namespace {

class SqliteKind final : public StoreKind {
  public:
    SqliteKind() { SqliteStore::create(path_); }

    std::unique_ptr<RecordStore> open(StoreGuard guard) override {
        return std::make_unique<SqliteStore>(path_, std::move(guard));
    }

  private:
    const pinwell::test::TemporaryDirectory directory_;
    const std::string path_ = directory_ / "records.sqlite";
};

#if PINWELL_LUMORA_POSTGRESQL
class PostgresKind final : public StoreKind {
  public:
    PostgresKind() { PostgresStore::create(place_); }

    std::unique_ptr<RecordStore> open(StoreGuard guard) override {
        return std::make_unique<PostgresStore>(place_, std::move(guard));
    }

  private:
    const PostgresPlace place_{.url = PostgresCluster::shared().makeDatabase(), .named = "test"};
};
#endif

}  // namespace

#if PINWELL_LUMORA_POSTGRESQL

std::unique_ptr<StoreKind> makeStoreKind(const std::string& kind) {
    if (kind == "Postgres") return std::make_unique<PostgresKind>();
    return std::make_unique<SqliteKind>();
}

std::optional<std::string> whyMissing(const std::string& kind) {
    return kind == "Postgres" ? PostgresCluster::missing() : std::nullopt;
}

#else

std::unique_ptr<StoreKind> makeStoreKind(const std::string&) {
    return std::make_unique<SqliteKind>();
}

std::optional<std::string> whyMissing(const std::string& kind) {
    if (kind == "Postgres") return "built without PostgreSQL";
    return std::nullopt;
}

#endif

}  // namespace pinwell::lumora::test
