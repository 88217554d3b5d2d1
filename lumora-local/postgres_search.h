// Searches of a PostgreSQL store, a page at a time.
#pragma once

#include "lumora-local/postgres_connection.h"
#include "lumora-local/record_store.h"

namespace pinwell::lumora {

/// Both throw PostgresError.
RecordPage searchRecords(PostgresConnection& connection, const RecordSearch& search, Deadline deadline);
EventPage searchEvents(PostgresConnection& connection, const EventSearch& search, Deadline deadline);

}  // namespace pinwell::lumora
