// The store that a service's description names: opening it, and moving its records into a PostgreSQL
// database.
#pragma once

#include <memory>
#include <string>

#include "record_store.h"
#include "sandbox/sandbox.h"
#include "service_directory.h"

namespace pinwell::lumora {

/// Opens it. The store refuses every change if the role of the service is lookup (EX_CONFIG). It refuses
/// every use once service.json names another store (EX_TEMPFAIL): new records in a migrated store would be
/// lost. Throws Failure; EX_CONFIG if a database cannot be reached or does not fit.
std::unique_ptr<RecordStore> openStore(const ServiceDirectory& directory);

/// Throws Failure (EX_CONFIG) if the role of the service is lookup.
void requireChangesAllowed(const ServiceDirectory& directory);

/// Adds to `rights` the store's needs during its use.
void addStoreRights(sandbox::Confinement& rights, const ServiceDirectory& directory);

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
    base::Data digest;  // SHA-256, over every field of every record and every event's hash
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
