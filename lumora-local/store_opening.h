// The store that a service's description names, opened.
#pragma once

#include <memory>

#include "lumora-local/record_store.h"
#include "lumora-local/service_directory.h"
#include "sandbox/sandbox.h"

namespace pinwell::lumora {

/// Opens it. The store refuses every change if the role of the service is lookup (EX_CONFIG). It refuses
/// every use once service.json names another store (EX_TEMPFAIL): new records in a migrated store would be
/// lost. Throws Failure; EX_CONFIG if a database cannot be reached or does not fit.
std::unique_ptr<RecordStore> openStore(const ServiceDirectory& directory);

/// Throws Failure (EX_CONFIG) if the role of the service is lookup.
void requireChangesAllowed(const ServiceDirectory& directory);

/// Adds to `rights` the store's needs during its use.
void addStoreRights(sandbox::Confinement& rights, const ServiceDirectory& directory);

}  // namespace pinwell::lumora
