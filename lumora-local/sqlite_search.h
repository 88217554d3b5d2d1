// Searches of a SQLite store, a page at a time. Each function runs within the caller's lock.
#pragma once

#include "lumora-local/record_store.h"

namespace SQLite {
class Database;
}

namespace pinwell::lumora {

RecordPage searchRecords(SQLite::Database& database, const RecordSearch& search);
EventPage searchEvents(SQLite::Database& database, const EventSearch& search);

}  // namespace pinwell::lumora
