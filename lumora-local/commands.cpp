#include "commands.h"

#include <filesystem>
#include <system_error>

#include "base/bytes.h"
#include "base/text.h"
#include "failure.h"
#include "values/format.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using values::Array;
using values::Dictionary;
using values::format;
using values::Value;

SignedRecord signRecord(const TicketSigner& signer, Record record, values::Date now) {
    record.signedAt = now;
    Data ticket = signer.makeTicket({record.hashes, record.revoked, record.signedAt});
    if (ticket.size() > kMaximumInlineTicketSize) record.asAsset = true;
    return {std::move(record), std::move(ticket)};
}

std::vector<Record> putAll(const Registry& registry, const std::vector<Record>& records, Occasion occasion) {
    std::vector<SignedRecord> signedRecords;
    std::vector<Record> put;
    for (const Record& record : records) {
        signedRecords.push_back(signRecord(registry.signer, record, registry.now()));
        put.push_back(signedRecords.back().record);
    }
    occasion.time = registry.now();
    occasion.actor = registry.actor;
    registry.store.put(registry.environment, signedRecords, occasion);
    return put;
}

Record recordOfArtefact(const Registry& registry, const std::string& path) {
    Artefact artefact = registry.hasher.examine(path);
    Record record;
    record.name = recordName(artefact.own);
    record.label = std::move(artefact.label);
    record.hashes = std::move(artefact.hashes);
    return record;
}

Record recordOfName(const std::string& name, const std::string& label) {
    std::optional<CodeHash> hash = parseRecordName(name);
    if (!hash) throw Failure(EX_USAGE, format("%@ is not the name of a record", name));
    Record record;
    record.name = name;
    record.label = label.empty() ? name : label;
    record.hashes.push_back(*std::move(hash));
    return record;
}

/// A record's name looks like a relative path, and a file may have this name: the record takes precedence.
Record recordOf(const Registry& registry, const std::string& subject) {
    if (parseRecordName(subject)) {
        if (const auto record = registry.store.find(registry.environment, subject)) return *record;
        std::error_code ignored;
        if (!std::filesystem::exists(subject, ignored)) {
            throw Failure(EX_DATAERR, format("there is no record %@", subject));
        }
    }
    const std::string name = recordName(registry.hasher.examine(subject).own);
    const auto record = registry.store.find(registry.environment, name);
    if (!record) throw Failure(EX_DATAERR, format("there is no record for %@ (%@)", subject, name));
    return *record;
}

Value asValue(const Record& record) {
    Array hashes;
    for (const CodeHash& hash : record.hashes) {
        hashes.push_back(Dictionary{{"algorithm", hash.algorithm}, {"hash", base::toHex(hash.hash)}});
    }
    return Dictionary{{"recordName", record.name},
                      {"label", base::escapeForDisplay(record.label)},
                      {"revoked", record.revoked},
                      {"asset", record.asAsset},
                      {"signatureTime", record.signedAt.seconds},
                      {"hashes", std::move(hashes)}};
}

}  // namespace

std::vector<Record> issue(const Registry& registry, const IssueRequest& request) {
    std::vector<Record> records;
    for (const std::string& name : request.recordNames) records.push_back(recordOfName(name, request.label));
    std::vector<Record> ofArtefacts;
    for (const std::string& path : request.paths) ofArtefacts.push_back(recordOfArtefact(registry, path));
    records.insert(records.begin(), ofArtefacts.begin(), ofArtefacts.end());
    for (Record& record : records) record.asAsset = request.asAsset;
    Occasion occasion;
    occasion.comment = request.comment;
    occasion.reinstates = request.reinstates;
    return putAll(registry, records, std::move(occasion));
}

std::vector<Record> revoke(const Registry& registry, const RevokeRequest& request) {
    std::vector<Record> records;
    for (const std::string& subject : request.subjects) {
        records.push_back(recordOf(registry, subject));
        records.back().revoked = true;
    }
    Occasion occasion;
    occasion.reason = request.reason;
    occasion.comment = request.comment;
    return putAll(registry, records, std::move(occasion));
}

namespace {

Change putOne(RecordStore& store, const TicketSigner& signer, Environment environment, Record record,
              const Occasion& occasion) {
    SignedRecord entry = signRecord(signer, std::move(record), occasion.time);
    PutOutcome outcome = store.put(environment, {entry}, occasion);
    if (outcome.earlier) return {std::move(outcome.event), *std::move(outcome.earlier)};
    return {std::move(outcome.event), std::move(entry.ticket)};
}

}  // namespace

Change issueDescribed(RecordStore& store, const TicketSigner& signer, Environment environment,
                      const DescribedArtefact& artefact, const Occasion& occasion) {
    Record record = recordOfName(recordName(artefact.own), artefact.label);
    record.hashes = listableHashes(artefact.own, artefact.others);
    return putOne(store, signer, environment, std::move(record), occasion);
}

std::optional<Change> revokeNamed(RecordStore& store, const TicketSigner& signer, Environment environment,
                                  const std::string& recordName, const Occasion& occasion) {
    std::optional<Record> record = store.find(environment, recordName);
    if (!record) return std::nullopt;
    record->revoked = true;
    return putOne(store, signer, environment, *std::move(record), occasion);
}

std::string describeRecords(const std::vector<Record>& records) {
    std::string text;
    for (const Record& record : records) {
        text += format("%s\t%@\t%s\t%@\t%zu\t%s\n", record.revoked ? "revoked" : "valid", record.name,
                       record.asAsset ? "asset" : "inline", record.signedAt, record.hashes.size(),
                       base::escapeForDisplay(record.label));
    }
    return text;
}

std::string recordsAsJson(const std::vector<Record>& records) {
    Array values;
    for (const Record& record : records) values.push_back(asValue(record));
    const auto document = values::serializeJSON(Dictionary{{"records", std::move(values)}});
    if (!document) throw Failure(EX_SOFTWARE, document.error().localizedDescription());
    return base::toString(*document) + "\n";
}

}  // namespace pinwell::lumora
