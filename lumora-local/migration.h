// Moving a service's records into a PostgreSQL database.
#pragma once

#include <string>

#include "lumora-local/record_store.h"
#include "lumora-local/service_directory.h"

namespace pinwell::lumora {

struct Migration {
    std::size_t records = 0;
    std::size_t events = 0;
    std::string head;            // hash of the last event
    std::string oldDescription;  // path of the service.json of before
};

/// The same for two stores with equal contents: the digest and the numbers.
struct ContentsSummary {
    std::size_t records = 0;
    std::size_t events = 0;
    foundation::Data digest;  // SHA-256, over every field of every record and every event's hash
    bool operator==(const ContentsSummary&) const = default;
};
ContentsSummary summarize(RecordStore& store);

/// Checks the service's records, copies them with their events to the database at `url`, reads both again and
/// compares them. Then it lets service.json name the database. Nobody can change the records meanwhile. The
/// copy is one transaction; if the process ends early, the service continues with its old store.
///
/// The database must be empty, or have the same contents as the store, so that a migration that was
/// interrupted after its copy can be repeated. Throws Failure; EX_CONFIG if the database is unusable or the
/// log is broken, EX_CANTCREAT if the database has other contents.
Migration migrate(const ServiceDirectory& directory, const std::string& url);

}  // namespace pinwell::lumora
