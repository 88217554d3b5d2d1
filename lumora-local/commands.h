// The operations on a service's records, as the command line names them.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "foundation/date.h"
#include "lumora-local/artefact.h"
#include "lumora-local/record_store.h"
#include "lumora-local/ticket_maker.h"

namespace pinwell::lumora {

/// Tickets beyond this are delivered as assets: an inline one grows by a third in the response.
inline constexpr std::size_t kMaximumInlineTicketSize = 1024 * 1024;

/// What issuing and revoking work on. References must outlive it.
struct Registry {
    RecordStore& store;
    const TicketSigner& signer;
    ArtefactHasher& hasher;
    Environment environment = Environment::production;
    std::function<foundation::Date()> now = foundation::Date::now;
};

/// A ticket for each artefact, all or none. An earlier record of the same artefact is replaced, a revoked one
/// included. Answers the records in the order of `paths`. Throws Failure.
std::vector<Record> issue(const Registry& registry, const std::vector<std::string>& paths, bool asAsset);

/// A revoked ticket in the place of the record that each subject names, all or none. A subject is a record's
/// name or an artefact's path. What has no record is an error (EX_DATAERR). Throws Failure.
std::vector<Record> revoke(const Registry& registry, const std::vector<std::string>& subjects);

/// For people: one line a record, tab-separated: status, name, delivery, signature time, number of hashes,
/// label.
std::string describeRecords(const std::vector<Record>& records);

/// For programs: one JSON document, {"records": [...]}.
std::string recordsAsJson(const std::vector<Record>& records);

}  // namespace pinwell::lumora
