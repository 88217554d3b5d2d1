// A record store in one SQLite database.
//
// The database is in WAL mode, so readers never wait; a writer waits for another one for a few seconds before
// it fails (EX_TEMPFAIL).
#pragma once

#include <memory>
#include <mutex>

#include "base/bytes.h"
#include "record_store.h"

namespace SQLite {
class Database;
class Statement;
}  // namespace SQLite

namespace pinwell::lumora {

class SqliteStore final : public RecordStore {
  public:
    /// Makes an empty store, readable only by its owner. Throws Failure if `path` exists.
    static void create(const std::string& path);

    /// Opens an existing one. A store of an earlier version is first upgraded in one transaction; a copy of
    /// its earlier state remains beside it (`PATH.version-N`). Throws Failure.
    explicit SqliteStore(const std::string& path, StoreGuard guard = {});
    ~SqliteStore() override;

    std::optional<Delivery> findTicket(Environment environment, const std::string& recordName) override;
    std::optional<base::Data> findAsset(const std::string& identifier) override;
    std::size_t countRecords() override;

    /// From `PRAGMA data_version` for other connections, and a count of this one's own changes.
    std::optional<std::uint64_t> changeCounter() override;
    PutOutcome put(Environment environment, const std::vector<SignedRecord>& records,
                   const Occasion& occasion) override;
    void noteRefusal(const RefusedAttempt& attempt, const Occasion& occasion) override;
    RecordPage search(const RecordSearch& search) override;
    EventPage search(const EventSearch& search) override;
    StoreFacts facts() override;
    std::optional<Record> find(Environment environment, const std::string& recordName) override;
    std::vector<Record> list(Environment environment) override;
    void forEachEvent(const EventQuery& query, const std::function<void(const Event&)>& visit) override;
    void walkHistory(const HistoryVisitor& visitor) override;
    std::string headHash() override;
    void walkContents(const ContentsVisitor& visitor) override;
    void holdStill(const std::function<void(const std::function<void()>& confirm)>& work) override;

  private:
    template <class Work>
    auto reading(Work work);
    template <class Work>
    auto changing(Work work);

    const std::string path_;
    const StoreGuard guard_;
    std::mutex mutex_;  // a connection's statements are not to be mixed
    std::unique_ptr<SQLite::Database> database_;
    // Prepared once: a lookup is shorter than the preparation of its statement.
    std::unique_ptr<SQLite::Statement> dataVersion_;
    std::unique_ptr<SQLite::Statement> findTicket_;
    std::int64_t lastDataVersion_ = 0;
    std::uint64_t changes_ = 0;
};

}  // namespace pinwell::lumora
