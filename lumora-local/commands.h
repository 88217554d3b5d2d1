// The operations on a service's records, as the command line names them.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "artefact_hasher.h"
#include "record_store.h"
#include "ticket_maker.h"
#include "values/date.h"

namespace pinwell::lumora {

/// Larger tickets are delivered as assets: an inline ticket grows by a third in the response.
inline constexpr std::size_t kMaximumInlineTicketSize = 1024 * 1024;

/// The objects for issuing and revoking. References must outlive it.
struct Registry {
    RecordStore& store;
    const TicketSigner& signer;
    ArtefactHasher& hasher;
    Environment environment = Environment::production;
    std::string actor;  // for the log
    std::function<values::Date()> now = values::Date::now;
};

/// The subjects and options of issuing.
struct IssueRequest {
    std::vector<std::string> paths;        // artefacts
    std::vector<std::string> recordNames;  // of artefacts that are not here; each ticket lists that one hash
    std::string label;                     // of `recordNames`; empty: the record's name
    bool asAsset = false;
    bool reinstates = false;  // makes revoked records valid again
    std::string comment;      // for the log
};

/// The subjects and options of revoking.
struct RevokeRequest {
    std::vector<std::string> subjects;  // names of records or paths of artefacts
    Reason reason = Reason::unspecified;
    std::string comment;  // for the log
};

/// Issues a ticket for each artefact and each record name, all or none. An earlier record of the same
/// artefact is replaced; a revoked one is refused (EX_DATAERR), unless the request reinstates. Returns the
/// records in the order of the request, artefacts first. Throws Failure: EX_USAGE for a name that is no
/// record's.
std::vector<Record> issue(const Registry& registry, const IssueRequest& request);

/// Replaces the ticket of each subject's record by a revoked one, for all or for none. A subject without a
/// record is an error (EX_DATAERR). Returns the records in the order of the request. Throws Failure.
std::vector<Record> revoke(const Registry& registry, const RevokeRequest& request);

/// An artefact on another machine, in its owner's description.
struct DescribedArtefact {
    std::string label;  // empty: the record's name
    CodeHash own;
    std::vector<CodeHash> others;  // that the ticket is to list as well; listableHashes() joins them
};

/// The result of one change.
struct Change {
    Event event;
    base::Data ticket;
};

/// Issues a ticket for one artefact by its description. If the occasion's request is a repetition, the result
/// is the one of the first time. Throws Failure like issue() and RecordStore::put().
Change issueDescribed(RecordStore& store, const TicketSigner& signer, Environment environment,
                      const DescribedArtefact& artefact, const Occasion& occasion);

/// Revokes the record of that name; `nullopt` if there is none. Throws Failure as issueDescribed() does.
std::optional<Change> revokeNamed(RecordStore& store, const TicketSigner& signer, Environment environment,
                                  const std::string& recordName, const Occasion& occasion);

/// For people: one line a record, tab-separated: status, name, delivery, signature time, number of hashes,
/// label.
std::string describeRecords(const std::vector<Record>& records);

/// For programs: one JSON document, {"records": [...]}.
std::string recordsAsJson(const std::vector<Record>& records);

}  // namespace pinwell::lumora
