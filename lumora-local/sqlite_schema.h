// The tables of a record store in SQLite, their versions, and the way from one version to the next.
#pragma once

#include <string>

namespace SQLite {
class Database;
}

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

}  // namespace pinwell::lumora
