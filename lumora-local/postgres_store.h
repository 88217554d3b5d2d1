// A record store in a PostgreSQL database, which several services share.
//
// A lost database affects only the calls that need it: each call makes a new connection, and fails with
// EX_TEMPFAIL after a bounded time. put() returns only after the server has the change on its disk. If a
// connection is lost during the commit, the store queries the outcome over the next one.
#pragma once

#include <functional>
#include <memory>
#include <string>

#include "postgres_pool.h"
#include "record_store.h"

namespace pinwell::lumora {

struct PostgresPlace {
    std::string url;              // "postgresql://...", as libpq reads it
    std::string named;            // for messages: the file and the key that name it
    bool forLookups = false;      // the server may be a read-only replica
    std::size_t connections = 8;  // at most
};

class PostgresStore final : public RecordStore {
  public:
    /// Makes a store in a database without one, and fills it with the output of `pour`, in one transaction.
    /// Throws Failure: EX_CONFIG if the database is unusable, EX_CANTCREAT if it has records or events
    /// already.
    static void create(const PostgresPlace& place,
                       const std::function<void(const ContentsVisitor&)>& pour = {});

    /// Opens a store that exists. One of an earlier version is brought forward first, in one transaction.
    /// Throws Failure (EX_CONFIG) that names the place.
    explicit PostgresStore(PostgresPlace place, StoreGuard guard = {});
    ~PostgresStore() override;

    std::optional<Delivery> findTicket(Environment environment, const std::string& recordName) override;
    std::vector<std::optional<Delivery>> findTickets(Environment environment,
                                                     std::span<const std::string> recordNames) override;
    std::optional<base::Data> findAsset(const std::string& identifier) override;
    std::size_t countRecords() override;
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
    void walking(Work work);
    PostgresPool::Lease beginWalk();
    PutOutcome changing(const std::function<PutOutcome(PostgresConnection&, Deadline)>& work);
    bool commit(PostgresPool::Lease& lease, Deadline deadline);
    bool wasCommitted(const std::string& eventHash, Deadline deadline);

    const PostgresPlace place_;
    const StoreGuard guard_;
    PostgresPool pool_;
};

}  // namespace pinwell::lumora
