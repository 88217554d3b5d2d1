// Rows of the SQLite tables, in and out. Each function runs within the caller's transaction.
#pragma once

#include <optional>
#include <string>

#include "lumora-local/record_store.h"

namespace SQLite {
class Database;
class Statement;
}  // namespace SQLite

namespace pinwell::lumora {

/// The exit status for a failure of the library, by its code, extended or not.
int exitStatusOfSqlite(int code) noexcept;

/// Of the columns `time, actor, action, environment, record, label, reason, comment, ticket, previous, hash`,
/// from the first column on. Throws Failure (EX_CONFIG) for an action, an environment or a reason that is not
/// one.
Event readEvent(const SQLite::Statement& row);

inline constexpr const char* kEventColumns =
    "time, actor, action, environment, record, label, reason, comment, ticket, previous, hash";

void insertEvent(SQLite::Database& database, const Event& event);

/// The outcome of the occasion's request if it was carried out before; `nullopt` if it was not, or if the
/// occasion has none. Throws ReusedKeyFailure.
std::optional<PutOutcome> findRequest(SQLite::Database& database, const Occasion& occasion);

/// Stores the occasion's request, if it has one, and removes some expired ones.
void keepRequest(SQLite::Database& database, const Occasion& occasion, const Event& event,
                 foundation::ByteView ticket);

/// hashBeforeTheFirstEvent() if there is none.
std::string lastEventHash(SQLite::Database& database);

}  // namespace pinwell::lumora
