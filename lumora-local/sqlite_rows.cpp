#include <SQLiteCpp/SQLiteCpp.h>
#include <sqlite3.h>

#include <limits>

#include "failure.h"
#include "sqlite_tables.h"
#include "store_rules.h"
#include "values/date.h"
#include "values/format.h"

namespace pinwell::lumora {

base::Data bytesOf(const SQLite::Column& column) {
    const auto* bytes = static_cast<const std::byte*>(column.getBlob());
    const base::ByteView view(bytes, bytes == nullptr ? 0 : static_cast<std::size_t>(column.getBytes()));
    return base::toData(view);
}

int exitStatusOfSqlite(int code) noexcept {
    switch (code & 0xFF) {
        case SQLITE_BUSY:
        case SQLITE_LOCKED:
            return EX_TEMPFAIL;
        case SQLITE_CANTOPEN:
            return EX_NOINPUT;
        case SQLITE_CORRUPT:
        case SQLITE_NOTADB:
        case SQLITE_FORMAT:
        case SQLITE_CONSTRAINT:
        case SQLITE_MISMATCH:
        case SQLITE_ERROR:  // our own statements fail so if a file lacks a table or a column of ours
            return EX_DATAERR;
        case SQLITE_PERM:
        case SQLITE_READONLY:
        case SQLITE_AUTH:
            return EX_NOPERM;
        default:  // a full or failing disk
            return EX_IOERR;
    }
}

Event readEvent(const SQLite::Statement& row) {
    const auto text = [&](int column) { return row.getColumn(column).getString(); };
    Event event;
    event.time = values::Date{row.getColumn(0).getInt64()};
    event.actor = text(1);
    event.action = knownName(parseAction(text(2)), "action", text(2));
    event.environment = knownName(parseEnvironment(text(3)), "environment", text(3));
    event.record = text(4);
    event.label = text(5);
    if (!row.getColumn(6).isNull()) event.reason = knownName(parseReason(text(6)), "reason", text(6));
    event.comment = text(7);
    event.ticket = text(8);
    event.previous = text(9);
    event.hash = text(10);
    return event;
}

void insertEvent(SQLite::Database& database, const Event& event) {
    SQLite::Statement statement(database, std::string("INSERT INTO event (") + kEventColumns +
                                              ") VALUES (?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?)");
    statement.bind(1, event.time.seconds);
    statement.bind(2, event.actor);
    statement.bind(3, std::string(toString(event.action)));
    statement.bind(4, std::string(toString(event.environment)));
    statement.bind(5, event.record);
    statement.bind(6, event.label);
    if (event.reason) statement.bind(7, std::string(toString(*event.reason)));
    statement.bind(8, event.comment);
    statement.bind(9, event.ticket);
    statement.bind(10, event.previous);
    statement.bind(11, event.hash);
    statement.exec();
}

std::optional<PutOutcome> findRequest(SQLite::Database& database, const Occasion& occasion) {
    if (!occasion.request) return std::nullopt;
    SQLite::Statement row(
        database, "SELECT digest, event, ticket FROM request WHERE client = ? AND key = ? AND made > ?");
    row.bind(1, occasion.request->client);
    row.bind(2, occasion.request->key);
    row.bind(3, occasion.time.seconds - kRequestLife);
    if (!row.executeStep()) return std::nullopt;
    if (row.getColumn(0).getString() != occasion.request->digest) throw ReusedKeyFailure();
    SQLite::Statement event(database, std::string("SELECT ") + kEventColumns + " FROM event WHERE hash = ?");
    event.bind(1, row.getColumn(1).getString());
    if (!event.executeStep()) throw Failure(EX_CONFIG, "record store: the event of a request is missing");
    return PutOutcome{readEvent(event), bytesOf(row.getColumn(2))};
}

void keepRequest(SQLite::Database& database, const Occasion& occasion, const Event& event,
                 base::ByteView ticket) {
    if (!occasion.request) return;
    SQLite::Statement expired(database,
                              "DELETE FROM request WHERE rowid IN (SELECT rowid FROM request WHERE made <= ?"
                              " ORDER BY made LIMIT 100)");
    expired.bind(1, occasion.time.seconds - kRequestLife);
    expired.exec();
    SQLite::Statement statement(database,
                                "INSERT OR REPLACE INTO request (client, key, digest, made, event, ticket) "
                                "VALUES (?, ?, ?, ?, ?, ?)");
    statement.bind(1, occasion.request->client);
    statement.bind(2, occasion.request->key);
    statement.bind(3, occasion.request->digest);
    statement.bind(4, occasion.time.seconds);
    statement.bind(5, event.hash);
    statement.bind(6, static_cast<const void*>(ticket.data()), static_cast<int>(ticket.size()));
    statement.exec();
}

std::string lastEventHash(SQLite::Database& database) {
    SQLite::Statement row(database, "SELECT hash FROM event ORDER BY position DESC LIMIT 1");
    return row.executeStep() ? row.getColumn(0).getString() : hashBeforeTheFirstEvent();
}

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
// The same expression as in the index record_by_label.
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
        const base::ByteView bytes(static_cast<const std::byte*>(column.getBlob()),
                                   static_cast<std::size_t>(column.getBytes()));
        all.push_back({hashes.getColumn(0).getUInt(), base::toData(bytes)});
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
        bindBytes(row, 4, base::toString(*search.hash));
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
        record.signedAt = values::Date{row.getColumn(3).getInt64()};
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
