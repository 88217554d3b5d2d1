#include <algorithm>

#include "base/byte_io.h"
#include "base/text.h"
#include "crypto/crypto.h"
#include "failure.h"
#include "postgres_tables.h"
#include "store_rules.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using base::ByteView;

// The memory of a batch is this, twice for the hexadecimal form of bytes, and libpq's copy.
constexpr std::size_t kBatchVolume = 2 * 1024 * 1024;

constexpr const char* kInsertRecords =
    "INSERT INTO record (environment, name, label, revoked, signed_at, asset, ticket)"
    " SELECT * FROM unnest($1::text[], $2::text[], $3::bytea[], $4::boolean[], $5::bigint[], $6::text[],"
    " $7::bytea[])";
constexpr const char* kInsertHashes =
    "INSERT INTO hash (environment, name, position, algorithm, hash)"
    " SELECT * FROM unnest($1::text[], $2::text[], $3::integer[], $4::bigint[], $5::bytea[])";
constexpr const char* kInsertEvents =
    "INSERT INTO event (position, time, actor, action, environment, record, label, reason, comment, ticket,"
    " previous, hash)"
    " SELECT * FROM unnest($1::bigint[], $2::bigint[], $3::bytea[], $4::text[], $5::text[], $6::text[],"
    " $7::bytea[], $8::text[], $9::bytea[], $10::text[], $11::text[], $12::text[])";

std::vector<CodeHash> readHashes(ByteView bytes, const std::string& name) {
    std::vector<CodeHash> hashes;
    try {
        base::ByteReader reader(bytes);
        while (!reader.atEnd()) {
            const std::uint64_t algorithm = reader.be64("algorithm");
            const std::uint32_t length = reader.be32("length of a hash");
            hashes.push_back(
                {static_cast<std::uint32_t>(algorithm), base::toData(reader.bytes(length, "hash"))});
        }
    } catch (const base::ShortRead&) {
        throw Failure(EX_CONFIG, values::format("record store: the hashes of %@ are damaged", name));
    }
    return hashes;
}

}  // namespace

std::string nameOf(Environment environment) {
    return std::string(toString(environment));
}

Event readEvent(const PostgresRows& rows, std::size_t row) {
    const auto text = [&](int column) { return rows.text(row, column); };
    Event event;
    event.time = values::Date{rows.integer(row, 0)};
    event.actor = text(1);
    event.action = knownName(parseAction(text(2)), "action", text(2));
    event.environment = knownName(parseEnvironment(text(3)), "environment", text(3));
    event.record = text(4);
    event.label = text(5);
    if (!rows.isNull(row, 6)) event.reason = knownName(parseReason(text(6)), "reason", text(6));
    event.comment = text(7);
    event.ticket = text(8);
    event.previous = text(9);
    event.hash = text(10);
    return event;
}

Record readRecord(const PostgresRows& rows, std::size_t row) {
    Record record;
    record.name = rows.text(row, 0);
    record.label = rows.text(row, 1);
    record.revoked = rows.boolean(row, 2);
    record.signedAt = values::Date{rows.integer(row, 3)};
    record.asAsset = rows.boolean(row, 4);
    record.hashes = readHashes(rows.bytes(row, 5), record.name);
    return record;
}

void PostgresArray::separate() {
    if (size_++ > 0) elements_ += ',';
}

void PostgresArray::text(std::string_view text) {
    separate();
    elements_ += '"';
    for (const char c : text) {
        if (c == '"' || c == '\\') elements_ += '\\';
        elements_ += c;
    }
    elements_ += '"';
}

void PostgresArray::bytes(ByteView bytes) {
    separate();
    elements_ += "\"\\\\x" + base::toHex(bytes) + '"';
}

void PostgresArray::number(std::int64_t number) {
    separate();
    elements_ += std::to_string(number);
}

void PostgresArray::boolean(bool value) {
    separate();
    elements_ += value ? 't' : 'f';
}

void PostgresArray::null() {
    separate();
    elements_ += "NULL";
}

void PostgresBatch::add(Environment environment, const SignedRecord& entry) {
    const Record& record = entry.record;
    records_[0].text(nameOf(environment));
    records_[1].text(record.name);
    records_[2].bytes(record.label);
    records_[3].boolean(record.revoked);
    records_[4].number(record.signedAt.seconds);
    if (record.asAsset) {
        records_[5].text(base::toHex(crypto::sha256(entry.ticket)));
    } else {
        records_[5].null();
    }
    records_[6].bytes(entry.ticket);
    volume_ += record.name.size() + record.label.size() + entry.ticket.size();

    std::int64_t position = 0;
    for (const CodeHash& hash : record.hashes) {
        hashes_[0].text(nameOf(environment));
        hashes_[1].text(record.name);
        hashes_[2].number(position++);
        hashes_[3].number(hash.algorithm);
        hashes_[4].bytes(hash.hash);
        volume_ += record.name.size() + hash.hash.size();
    }
}

void PostgresBatch::add(const Event& event, std::int64_t position) {
    events_[0].number(position);
    events_[1].number(event.time.seconds);
    events_[2].bytes(event.actor);
    events_[3].text(toString(event.action));
    events_[4].text(nameOf(event.environment));
    events_[5].text(event.record);
    events_[6].bytes(event.label);
    if (event.reason) {
        events_[7].text(toString(*event.reason));
    } else {
        events_[7].null();
    }
    events_[8].bytes(event.comment);
    events_[9].text(event.ticket);
    events_[10].text(event.previous);
    events_[11].text(event.hash);
    volume_ += event.record.size() + event.label.size() + event.comment.size() + 4 * event.hash.size();
}

bool PostgresBatch::isFull() const noexcept {
    return volume_ >= kBatchVolume;
}

void PostgresBatch::write(PostgresConnection& connection, Deadline deadline) {
    const auto insert = [&](const char* sql, std::vector<PostgresArray>& columns) {
        if (columns.front().size() == 0) return;
        std::vector<PostgresParameter> parameters;
        for (const PostgresArray& column : columns) parameters.push_back(column.parameter());
        connection.query(sql, parameters, deadline);
    };
    insert(kInsertRecords, records_);
    insert(kInsertHashes, hashes_);
    insert(kInsertEvents, events_);
    *this = PostgresBatch();
}

std::optional<PutOutcome> findRequest(PostgresConnection& connection, const Occasion& occasion,
                                      Deadline deadline) {
    if (!occasion.request) return std::nullopt;
    const PostgresRows rows = connection.query(
        "SELECT digest, event, ticket FROM request WHERE client = $1 AND key = $2 AND made > $3",
        {PostgresParameter::bytes(occasion.request->client), occasion.request->key,
         occasion.time.seconds - kRequestLife},
        deadline);
    if (rows.size() == 0) return std::nullopt;
    if (rows.text(0, 0) != occasion.request->digest) throw ReusedKeyFailure();
    static const std::string sql =
        std::string("SELECT ") + kPostgresEventColumns + " FROM event WHERE hash = $1";
    const PostgresRows events = connection.query(sql.c_str(), {rows.text(0, 1)}, deadline);
    if (events.size() == 0) throw Failure(EX_CONFIG, "record store: the event of a request is missing");
    return PutOutcome{readEvent(events, 0), base::toData(rows.bytes(0, 2))};
}

void keepRequest(PostgresConnection& connection, const Occasion& occasion, const Event& event,
                 ByteView ticket, Deadline deadline) {
    if (!occasion.request) return;
    connection.query(
        "DELETE FROM request WHERE (client, key) IN"
        " (SELECT client, key FROM request WHERE made <= $1 ORDER BY made LIMIT 100)",
        {occasion.time.seconds - kRequestLife}, deadline);
    connection.query(
        "INSERT INTO request (client, key, digest, made, event, ticket) VALUES ($1, $2, $3, $4, $5, $6)"
        " ON CONFLICT (client, key) DO UPDATE SET digest = excluded.digest, made = excluded.made,"
        " event = excluded.event, ticket = excluded.ticket",
        {PostgresParameter::bytes(occasion.request->client), occasion.request->key, occasion.request->digest,
         occasion.time.seconds, event.hash, PostgresParameter::bytes(ticket)},
        deadline);
}

bool canNameARecord(std::string_view name) {
    return !name.empty() &&
           std::all_of(name.begin(), name.end(), [](char c) { return c > ' ' && c < '\x7f'; });
}

namespace {

static_assert(kSearchedLabelBytes == 64);  // the same number as in the index record_by_label

std::vector<FoundRecord> foundIn(const PostgresRows& rows) {
    std::vector<FoundRecord> found;
    for (std::size_t row = 0; row < rows.size(); ++row) found.push_back(cutHashes(readRecord(rows, row)));
    return found;
}

std::int64_t oneMore(std::size_t limit) {
    return static_cast<std::int64_t>(limit) + 1;
}

PostgresRows rowsByName(PostgresConnection& connection, const RecordSearch& search, Deadline deadline) {
    static const std::string sql =
        std::string("SELECT ") + kPostgresFoundRecordColumns +
        " FROM record r WHERE r.environment = $1 AND r.name >= $2 AND r.name < $3 ORDER BY r.name LIMIT $4";
    const SearchRange range = rangeOf(search);
    return connection.query(
        sql.c_str(), {nameOf(search.environment), range.firstName, range.endName, oneMore(search.limit)},
        deadline);
}

PostgresRows rowsByHash(PostgresConnection& connection, const RecordSearch& search, Deadline deadline) {
    static const std::string sql =
        std::string("SELECT ") + kPostgresFoundRecordColumns +
        " FROM (SELECT DISTINCT name FROM hash WHERE environment = $1 AND hash = $2 AND name >= $3"
        " ORDER BY name LIMIT $4) f JOIN record r ON r.environment = $1 AND r.name = f.name ORDER BY r.name";
    return connection.query(sql.c_str(),
                            {nameOf(search.environment), PostgresParameter::bytes(*search.hash),
                             rangeOf(search).firstName, oneMore(search.limit)},
                            deadline);
}

PostgresRows rowsByLabel(PostgresConnection& connection, const RecordSearch& search, Deadline deadline) {
    static const std::string sql =
        std::string("SELECT ") + kPostgresFoundRecordColumns +
        " FROM record r WHERE r.environment = $1 AND substring(r.label from 1 for 64) < $2"
        " AND (substring(r.label from 1 for 64), r.name) > ($3, $4)"
        " ORDER BY substring(r.label from 1 for 64), r.name LIMIT $5";
    const SearchRange range = rangeOf(search);
    return connection.query(
        sql.c_str(),
        {nameOf(search.environment), PostgresParameter::bytes(range.endLabel),
         PostgresParameter::bytes(range.firstLabel), range.firstName, oneMore(search.limit)},
        deadline);
}

}  // namespace

RecordPage searchRecords(PostgresConnection& connection, const RecordSearch& search, Deadline deadline) {
    const PostgresRows rows = search.hash    ? rowsByHash(connection, search, deadline)
                              : search.label ? rowsByLabel(connection, search, deadline)
                                             : rowsByName(connection, search, deadline);
    return makePage(foundIn(rows), search.limit, search.label.has_value());
}

EventPage searchEvents(PostgresConnection& connection, const EventSearch& search, Deadline deadline) {
    static const std::string select =
        std::string("SELECT ") + kPostgresEventColumns + ", position FROM event WHERE ";
    static const std::string ofRecord =
        select + "environment = $1 AND record = $2 AND position > $3 ORDER BY position LIMIT $4";
    static const std::string ofTime = select + "(time, position) > ($1, $2) ORDER BY time, position LIMIT $3";
    static const std::string ofAll = select + "position > $1 ORDER BY position LIMIT $2";
    EventPageMaker maker(search);
    const auto limit = static_cast<std::int64_t>(maker.rows());
    const std::int64_t position = search.after ? search.after->position : 0;
    const auto query = [&]() {
        if (search.record) {
            return connection.query(ofRecord.c_str(),
                                    {nameOf(search.environment), *search.record, position, limit}, deadline);
        }
        if (search.since) {
            const std::int64_t time = search.after ? search.after->time : search.since->seconds;
            return connection.query(ofTime.c_str(), {time, position, limit}, deadline);
        }
        return connection.query(ofAll.c_str(), {position, limit}, deadline);
    };
    const PostgresRows rows = query();
    for (std::size_t row = 0; row < rows.size(); ++row) {
        if (!maker.take(readEvent(rows, row), rows.integer(row, 11))) break;
    }
    return maker.finish();
}

PostgresHead lastEventOf(PostgresConnection& connection, Deadline deadline) {
    const PostgresRows rows =
        connection.query("SELECT hash, position FROM event ORDER BY position DESC LIMIT 1", {}, deadline);
    if (rows.size() == 0) return {};
    return {rows.text(0, 0), rows.integer(0, 1)};
}

void requireName(const std::string& name) {
    if (!canNameARecord(name))
        throw Failure(EX_DATAERR, values::format("%@ is not the name of a record", name));
}

}  // namespace pinwell::lumora
