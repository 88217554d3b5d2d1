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

/// Of the columns `time, actor, action, environment, record, label, reason, comment, ticket, previous, hash`,
/// from the first column on. Throws Failure (EX_CONFIG) for an action, an environment or a reason that is not
/// one.
Event readEvent(const SQLite::Statement& row);

inline constexpr const char* kEventColumns =
    "time, actor, action, environment, record, label, reason, comment, ticket, previous, hash";

void insertEvent(SQLite::Database& database, const Event& event);

/// hashBeforeTheFirstEvent() if there is none.
std::string lastEventHash(SQLite::Database& database);

}  // namespace pinwell::lumora
