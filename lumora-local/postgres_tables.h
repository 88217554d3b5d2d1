// The tables of a record store in PostgreSQL: their versions, their rows in and out, and searches of them.
//
// All of them are in the schema `lumora` of the service's own database, whose encoding is UTF-8. Names of
// records are text, because they are ASCII. Labels, actors and comments are bytes: they come from file names
// and command lines, which may be in any encoding, and the chain of events is over their bytes.
//
// The table `store` has one row. Every writer locks it first. So only one writes at a time, and the chain of
// events stays one chain.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "postgres_connection.h"
#include "record_store.h"

namespace pinwell::lumora {

inline constexpr int kPostgresVersion = 2;

/// The version of the store's tables; `nullopt` if the database has none. Throws PostgresError.
std::optional<int> postgresVersion(PostgresConnection& connection, Deadline deadline);

/// Within the caller's transaction: makes the tables, or upgrades tables of an earlier version to the current
/// one. Throws PostgresError.
void upgradePostgresSchema(PostgresConnection& connection, Deadline deadline);

inline constexpr const char* kBeginPostgresChange = "BEGIN ISOLATION LEVEL READ COMMITTED READ WRITE";

/// Locks the store until the end of the caller's transaction. Throws PostgresError; Failure (EX_CONFIG) if
/// another process has brought it to another version.
void lockStore(PostgresConnection& connection, Deadline deadline);

/// The end of the chain of events.
struct PostgresHead {
    std::string hash = hashBeforeTheFirstEvent();
    std::int64_t position = 0;
};
PostgresHead lastEventOf(PostgresConnection& connection, Deadline deadline);

inline constexpr const char* kPostgresEventColumns =
    "time, actor, action, environment, record, label, reason, comment, ticket, previous, hash";

/// As the tables have it.
std::string nameOf(Environment environment);

/// Of the columns above. Throws Failure (EX_CONFIG) for an action, an environment or a reason that is not
/// one.
Event readEvent(const PostgresRows& rows, std::size_t row);

/// Columns of a record `r`. The last one has all its hashes: for each the algorithm (8 bytes) and the length
/// (4 bytes), both big-endian, and the bytes.
inline constexpr const char* kPostgresRecordColumns =
    "r.name, r.label, r.revoked, r.signed_at, r.asset IS NOT NULL,"
    " (SELECT string_agg(int8send(h.algorithm) || int4send(length(h.hash)) || h.hash, '' ORDER BY h.position)"
    "  FROM hash h WHERE h.environment = r.environment AND h.name = r.name)";

/// Of the columns above. Throws Failure (EX_CONFIG) for hashes that do not have this form.
Record readRecord(const PostgresRows& rows, std::size_t row);

/// The same columns, but the last one has only the first 101 hashes.
inline constexpr const char* kPostgresFoundRecordColumns =
    "r.name, r.label, r.revoked, r.signed_at, r.asset IS NOT NULL,"
    " (SELECT string_agg(int8send(h.algorithm) || int4send(length(h.hash)) || h.hash, '' ORDER BY h.position)"
    "  FROM (SELECT * FROM hash WHERE environment = r.environment AND name = r.name"
    "        ORDER BY position LIMIT 101) h)";
static_assert(kHashesInSearch + 1 == 101);

/// The outcome of the occasion's request if it was carried out before; `nullopt` if it was not, or if the
/// occasion has none. Throws ReusedKeyFailure.
std::optional<PutOutcome> findRequest(PostgresConnection& connection, const Occasion& occasion,
                                      Deadline deadline);

/// Stores the occasion's request, if it has one, and removes some expired ones.
void keepRequest(PostgresConnection& connection, const Occasion& occasion, const Event& event,
                 base::ByteView ticket, Deadline deadline);

/// The text form of an array parameter, element by element.
class PostgresArray {
  public:
    void text(std::string_view text);
    void bytes(base::ByteView bytes);
    void bytes(std::string_view bytes) { this->bytes(base::asBytes(bytes)); }
    void number(std::int64_t number);
    void boolean(bool value);
    void null();

    std::size_t size() const noexcept { return size_; }
    PostgresParameter parameter() const { return {"{" + elements_ + "}"}; }

  private:
    void separate();

    std::string elements_;
    std::size_t size_ = 0;
};

/// Many records or events for one statement each.
class PostgresBatch {
  public:
    void add(Environment environment, const SignedRecord& entry);
    void add(const Event& event, std::int64_t position);

    /// Worth a round trip to the server.
    bool isFull() const noexcept;

    /// Writes the added rows within the caller's transaction, and empties the batch. Throws PostgresError.
    void write(PostgresConnection& connection, Deadline deadline);

  private:
    std::vector<PostgresArray> records_{7};
    std::vector<PostgresArray> hashes_{5};
    std::vector<PostgresArray> events_{12};
    std::size_t volume_ = 0;
};

/// Whether the text is printable ASCII. No other text names a record of this store.
bool canNameARecord(std::string_view name);

/// Throws Failure (EX_DATAERR) unless canNameARecord().
void requireName(const std::string& name);

/// Searches, a page at a time. Both throw PostgresError.
RecordPage searchRecords(PostgresConnection& connection, const RecordSearch& search, Deadline deadline);
EventPage searchEvents(PostgresConnection& connection, const EventSearch& search, Deadline deadline);

}  // namespace pinwell::lumora
