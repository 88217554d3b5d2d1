#include "lumora-local/sqlite_search.h"

#include <SQLiteCpp/SQLiteCpp.h>

#include <limits>

#include "lumora-local/sqlite_rows.h"
#include "lumora-local/store_rules.h"

namespace pinwell::lumora {
namespace {

// Of a record `r`. Parameters: ?1 the environment, ?2 the limit, ?3 the name at which the page begins (after
// which, in a search by label).
const std::string kColumns = "SELECT r.name, r.label, r.revoked, r.signed_at, r.asset IS NOT NULL FROM ";
const std::string kByName = kColumns +
                            "record r WHERE r.environment = ?1 AND r.name >= ?3 AND r.name < ?4"
                            " ORDER BY r.name LIMIT ?2";
const std::string kByHash = kColumns +
                            "(SELECT DISTINCT name FROM hash WHERE environment = ?1 AND hash = ?4"
                            " AND name >= ?3 ORDER BY name LIMIT ?2) h"
                            " JOIN record r ON r.environment = ?1 AND r.name = h.name ORDER BY r.name";
// As the index record_by_label has it.
const std::string kLabelKey = "substr(CAST(r.label AS BLOB), 1, 64)";
const std::string kByLabel = kColumns + "record r WHERE r.environment = ?1 AND " + kLabelKey + " < ?5 AND (" +
                             kLabelKey + ", r.name) > (?4, ?3) ORDER BY " + kLabelKey + ", r.name LIMIT ?2";
static_assert(kSearchedLabelBytes == 64);

void bindBytes(SQLite::Statement& statement, int index, std::string_view bytes) {
    statement.bind(index, static_cast<const void*>(bytes.data()), static_cast<int>(bytes.size()));
}

void bindNumber(SQLite::Statement& statement, int index, std::size_t number) {
    statement.bind(index, static_cast<std::int64_t>(number));
}

std::vector<CodeHash> firstHashes(SQLite::Statement& hashes, const std::string& name) {
    hashes.reset();
    hashes.bind(2, name);
    std::vector<CodeHash> all;
    while (hashes.executeStep()) {
        const SQLite::Column column = hashes.getColumn(1);
        const foundation::ByteView bytes(static_cast<const std::byte*>(column.getBlob()),
                                         static_cast<std::size_t>(column.getBytes()));
        all.push_back({hashes.getColumn(0).getUInt(), foundation::toData(bytes)});
    }
    return all;
}

std::string statementOf(const EventSearch& search) {
    const std::string select = std::string("SELECT ") + kEventColumns + ", position FROM event WHERE ";
    if (search.record)
        return select + "environment = ?2 AND record = ?3 AND position > ?4 ORDER BY position LIMIT ?1";
    if (search.since) return select + "(time, position) > (?3, ?4) ORDER BY time, position LIMIT ?1";
    return select + "position > ?4 ORDER BY position LIMIT ?1";
}

}  // namespace

RecordPage searchRecords(SQLite::Database& database, const RecordSearch& search) {
    SQLite::Statement row(database, search.hash ? kByHash : search.label ? kByLabel : kByName);
    row.bind(1, std::string(toString(search.environment)));
    bindNumber(row, 2, search.limit + 1);
    const SearchRange range = rangeOf(search);
    row.bind(3, range.firstName);
    if (search.hash) {
        bindBytes(row, 4, foundation::toString(*search.hash));
    } else if (search.label) {
        bindBytes(row, 4, range.firstLabel);
        bindBytes(row, 5, range.endLabel);
    } else {
        row.bind(4, range.endName);
    }
    SQLite::Statement hashes(database,
                             "SELECT algorithm, hash FROM hash WHERE environment = ?1 AND name = ?2"
                             " ORDER BY position LIMIT ?3");
    hashes.bind(1, std::string(toString(search.environment)));
    bindNumber(hashes, 3, kHashesInSearch + 1);
    std::vector<FoundRecord> found;
    while (row.executeStep()) {
        Record record;
        record.name = row.getColumn(0).getString();
        record.label = row.getColumn(1).getString();
        record.revoked = row.getColumn(2).getInt() != 0;
        record.signedAt = foundation::Date{row.getColumn(3).getInt64()};
        record.asAsset = row.getColumn(4).getInt() != 0;
        record.hashes = firstHashes(hashes, record.name);
        found.push_back(cutHashes(std::move(record)));
    }
    return makePage(std::move(found), search.limit, search.label.has_value());
}

EventPage searchEvents(SQLite::Database& database, const EventSearch& search) {
    EventPageMaker maker(search);
    SQLite::Statement row(database, statementOf(search));
    bindNumber(row, 1, maker.rows());
    if (search.record) {
        row.bind(2, std::string(toString(search.environment)));
        row.bind(3, *search.record);
    } else if (search.since) {
        row.bind(3, search.after ? search.after->time : search.since->seconds);
    }
    row.bind(4, search.after ? search.after->position : 0);
    while (row.executeStep()) {
        if (!maker.take(readEvent(row), row.getColumn(11).getInt64())) break;
    }
    return maker.finish();
}

}  // namespace pinwell::lumora
