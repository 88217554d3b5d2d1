// The tables of a record store in SQLite: their versions, their rows, and searches of them. For the store and
// the backup. Each function about rows runs within the caller's transaction, each search within the caller's
// lock.
#pragma once

#include <optional>
#include <string>

#include "record_store.h"

namespace SQLite {
class Column;
class Database;
class Statement;
}  // namespace SQLite

namespace pinwell::lumora {

/// The time that a writer waits for another process's write.
inline constexpr int kBusyTimeoutMilliseconds = 10'000;

/// Settings that every connection needs.
void configureSqlite(SQLite::Database& database);

/// Makes the tables of the current version, in one transaction.
void createSqliteSchema(SQLite::Database& database);

/// Brings the database at `path` to the current version, if it has an earlier one: one transaction, and a
/// copy of the earlier database beside it. Throws Failure (EX_DATAERR) for a version that is not known.
void upgradeSqliteSchema(SQLite::Database& database, const std::string& path);

/// The exit status for a failure of the library, by its code, extended or not.
int exitStatusOfSqlite(int code) noexcept;

/// Of the columns `time, actor, action, environment, record, label, reason, comment, ticket, previous, hash`,
/// from the first column on. Throws Failure (EX_CONFIG) for an action, an environment or a reason that is not
/// one.
Event readEvent(const SQLite::Statement& row);

/// Empty for NULL.
base::Data bytesOf(const SQLite::Column& column);

inline constexpr const char* kEventColumns =
    "time, actor, action, environment, record, label, reason, comment, ticket, previous, hash";

void insertEvent(SQLite::Database& database, const Event& event);

/// The outcome of the occasion's request if it was carried out before; `nullopt` if it was not, or if the
/// occasion has none. Throws ReusedKeyFailure.
std::optional<PutOutcome> findRequest(SQLite::Database& database, const Occasion& occasion);

/// Stores the occasion's request, if it has one, and removes some expired ones.
void keepRequest(SQLite::Database& database, const Occasion& occasion, const Event& event,
                 base::ByteView ticket);

/// hashBeforeTheFirstEvent() if there is none.
std::string lastEventHash(SQLite::Database& database);

/// Searches, a page at a time.
RecordPage searchRecords(SQLite::Database& database, const RecordSearch& search);
EventPage searchEvents(SQLite::Database& database, const EventSearch& search);

}  // namespace pinwell::lumora
