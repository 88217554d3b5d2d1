// The tables of a record store in PostgreSQL, their versions, and the way from one version to the next.
//
// All of them are in the schema `lumora` of the service's own database, whose encoding is UTF-8. Names of
// records are text, because they are ASCII. Labels, actors and comments are bytes: they come from file names
// and command lines, which may be in any encoding, and the chain of events is over their bytes.
//
// The table `store` has one row. Every writer locks it first. So only one writes at a time, and the chain of
// events stays one chain.
#pragma once

#include <optional>

#include "lumora-local/postgres_connection.h"

namespace pinwell::lumora {

inline constexpr int kPostgresVersion = 2;

/// The version of the store's tables; `nullopt` if the database has none. Throws PostgresError.
std::optional<int> postgresVersion(PostgresConnection& connection, Deadline deadline);

/// Within the caller's transaction: makes the tables, or upgrades tables of an earlier version to the current
/// one. Throws PostgresError.
void upgradePostgresSchema(PostgresConnection& connection, Deadline deadline);

}  // namespace pinwell::lumora
