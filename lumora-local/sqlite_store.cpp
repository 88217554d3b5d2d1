#include "sqlite_store.h"

#include <SQLiteCpp/SQLiteCpp.h>

#include <functional>
#include <limits>
#include <utility>

#include "base/text.h"
#include "crypto/crypto.h"
#include "failure.h"
#include "file_writing.h"
#include "sqlite_tables.h"
#include "store_rules.h"
#include "values/date.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using base::ByteView;
using base::Data;
using values::Date;
using values::format;

/// Runs database work, and turns the library's exceptions into Failure.
template <class Work>
auto guarded(Work&& work) {
    try {
        return std::forward<Work>(work)();
    } catch (const SQLite::Exception& error) {
        throw Failure(exitStatusOfSqlite(error.getErrorCode()), format("record store: %s", error.what()));
    }
}

std::string environmentText(Environment environment) {
    return std::string(toString(environment));
}

/// Ends a reused statement, which keeps its transaction open until then.
class UnfinishedStatement {
  public:
    explicit UnfinishedStatement(SQLite::Statement& statement) : statement_(statement) {}
    ~UnfinishedStatement() { statement_.tryReset(); }
    UnfinishedStatement(const UnfinishedStatement&) = delete;
    UnfinishedStatement& operator=(const UnfinishedStatement&) = delete;

  private:
    SQLite::Statement& statement_;
};

void bindBlob(SQLite::Statement& statement, int index, ByteView bytes) {
    if (bytes.size() > static_cast<std::size_t>(std::numeric_limits<int>::max())) {
        throw Failure(EX_DATAERR, "a ticket too large for the record store");
    }
    statement.bind(index, static_cast<const void*>(bytes.data()), static_cast<int>(bytes.size()));
}

/// Of the record of that name; `nullopt` if there is none.
std::optional<bool> isRevoked(SQLite::Database& database, Environment environment, const std::string& name) {
    SQLite::Statement row(database, "SELECT revoked FROM record WHERE environment = ? AND name = ?");
    row.bind(1, environmentText(environment));
    row.bind(2, name);
    if (!row.executeStep()) return std::nullopt;
    return row.getColumn(0).getInt() != 0;
}

/// A revoked record, other than `record`, that a valid ticket for `record` would get around; `nullopt` if
/// there is none. Clients compare the bytes of a hash and not its algorithm, so the same hash under another
/// name counts. The other hashes of a revoked artefact count if one of them is to get its own ticket. Hashes
/// that two artefacts merely share, such as nested code, do not.
std::optional<RevokedElsewhere> revokedBeside(SQLite::Database& database, Environment environment,
                                              const Record& record) {
    SQLite::Statement row(database,
                          "SELECT r.environment, r.name FROM hash h JOIN record r"
                          " ON r.environment = h.environment AND r.name = h.name"
                          " WHERE h.hash = ?1 AND h.environment IN (?2, 'production')"
                          " AND (r.environment <> ?2 OR r.name <> ?3) AND r.revoked"
                          " AND (?4 OR h.position = 0) LIMIT 1");
    for (const CodeHash& hash : record.hashes) {
        row.reset();
        bindBlob(row, 1, hash.hash);
        row.bind(2, environmentText(environment));
        row.bind(3, record.name);
        row.bind(4, &hash == &record.hashes.front() ? 1 : 0);
        if (!row.executeStep()) continue;
        return RevokedElsewhere{parseEnvironment(row.getColumn(0).getString()).value_or(environment),
                                row.getColumn(1).getString()};
    }
    return std::nullopt;
}

Standing standingOf(SQLite::Database& database, Environment environment, const Record& record) {
    Standing standing{isRevoked(database, environment, record.name), std::nullopt};
    if (!record.revoked) standing.elsewhere = revokedBeside(database, environment, record);
    return standing;
}

void deleteRecord(SQLite::Database& database, Environment environment, const std::string& name) {
    SQLite::Statement statement(database, "DELETE FROM record WHERE environment = ? AND name = ?");
    statement.bind(1, environmentText(environment));
    statement.bind(2, name);
    statement.exec();
}

void insertRecord(SQLite::Database& database, Environment environment, const SignedRecord& entry) {
    const Record& record = entry.record;
    SQLite::Statement statement(
        database,
        "INSERT INTO record (environment, name, label, revoked, signed_at, asset, ticket)"
        " VALUES (?, ?, ?, ?, ?, ?, ?)");
    statement.bind(1, environmentText(environment));
    statement.bind(2, record.name);
    statement.bind(3, record.label);
    statement.bind(4, record.revoked ? 1 : 0);
    statement.bind(5, record.signedAt.seconds);
    if (record.asAsset) statement.bind(6, base::toHex(crypto::sha256(entry.ticket)));
    bindBlob(statement, 7, entry.ticket);
    statement.exec();
}

std::vector<CodeHash> hashesOf(SQLite::Database& database, Environment environment, const std::string& name) {
    std::vector<CodeHash> hashes;
    SQLite::Statement row(
        database, "SELECT algorithm, hash FROM hash WHERE environment = ? AND name = ? ORDER BY position");
    row.bind(1, environmentText(environment));
    row.bind(2, name);
    while (row.executeStep()) hashes.push_back({row.getColumn(0).getUInt(), bytesOf(row.getColumn(1))});
    return hashes;
}

void insertHashes(SQLite::Database& database, Environment environment, const Record& record) {
    SQLite::Statement statement(
        database, "INSERT INTO hash (environment, name, position, algorithm, hash) VALUES (?, ?, ?, ?, ?)");
    std::int64_t position = 0;
    for (const CodeHash& hash : record.hashes) {
        statement.reset();
        statement.bind(1, environmentText(environment));
        statement.bind(2, record.name);
        statement.bind(3, position++);
        statement.bind(4, hash.algorithm);
        bindBlob(statement, 5, hash.hash);
        statement.exec();
    }
}

void walkEvents(SQLite::Database& database, const std::function<void(const Event&)>& visit) {
    SQLite::Statement row(database, std::string("SELECT ") + kEventColumns + " FROM event ORDER BY position");
    while (row.executeStep()) visit(readEvent(row));
}

constexpr const char* kRecordColumns =
    "SELECT name, label, revoked, signed_at, asset IS NOT NULL FROM record ";

Record readRecord(SQLite::Database& database, Environment environment, SQLite::Statement& row) {
    Record record;
    record.name = row.getColumn(0).getString();
    record.label = row.getColumn(1).getString();
    record.revoked = row.getColumn(2).getInt() != 0;
    record.signedAt = Date{row.getColumn(3).getInt64()};
    record.asAsset = row.getColumn(4).getInt() != 0;

    record.hashes = hashesOf(database, environment, record.name);
    return record;
}

}  // namespace

void SqliteStore::create(const std::string& path) {
    writeNewFile(path, {}, kPrivateFileMode);  // SQLite gives the files that it adds the mode of this one
    guarded([&] {
        SQLite::Database database(path, SQLite::OPEN_READWRITE, kBusyTimeoutMilliseconds);
        configureSqlite(database);
        database.exec("PRAGMA journal_mode = WAL");
        createSqliteSchema(database);
    });
}

SqliteStore::SqliteStore(const std::string& path, StoreGuard guard) : path_(path), guard_(std::move(guard)) {
    guarded([&] {
        database_ =
            std::make_unique<SQLite::Database>(path, SQLite::OPEN_READWRITE, kBusyTimeoutMilliseconds);
        configureSqlite(*database_);
        upgradeSqliteSchema(*database_, path);
        dataVersion_ = std::make_unique<SQLite::Statement>(*database_, "PRAGMA data_version");
        findTicket_ = std::make_unique<SQLite::Statement>(
            *database_,
            "SELECT asset, length(ticket), CASE WHEN asset IS NULL THEN ticket END"
            " FROM record WHERE environment = ? AND name = ?");
    });
}

SqliteStore::~SqliteStore() = default;

template <class Work>
auto SqliteStore::reading(Work work) {
    if (guard_) guard_(StoreUse::reading);
    const std::lock_guard lock(mutex_);
    return guarded(work);
}

std::optional<Delivery> SqliteStore::findTicket(Environment environment, const std::string& recordName) {
    return reading([&]() -> std::optional<Delivery> {
        // The asset's bytes are not read: the response needs only their number.
        SQLite::Statement& row = *findTicket_;
        const UnfinishedStatement unfinished(row);
        row.bind(1, environmentText(environment));
        row.bind(2, recordName);
        if (!row.executeStep()) return std::nullopt;
        Delivery delivery;
        if (row.getColumn(0).isNull()) {
            delivery.inlineTicket = bytesOf(row.getColumn(2));
        } else {
            delivery.asset = Delivery::Asset{row.getColumn(0).getString(),
                                             static_cast<std::uint64_t>(row.getColumn(1).getInt64())};
        }
        return delivery;
    });
}

std::optional<std::uint64_t> SqliteStore::changeCounter() {
    return reading([&]() -> std::optional<std::uint64_t> {
        const UnfinishedStatement unfinished(*dataVersion_);
        if (!dataVersion_->executeStep()) return std::nullopt;
        const std::int64_t version = dataVersion_->getColumn(0).getInt64();
        if (version != std::exchange(lastDataVersion_, version)) ++changes_;
        return changes_;
    });
}

std::optional<Data> SqliteStore::findAsset(const std::string& identifier) {
    return reading([&]() -> std::optional<Data> {
        SQLite::Statement row(*database_, "SELECT ticket FROM record WHERE asset = ? LIMIT 1");
        row.bind(1, identifier);
        if (!row.executeStep()) return std::nullopt;
        return bytesOf(row.getColumn(0));
    });
}

std::size_t SqliteStore::countRecords() {
    return reading([&] {
        return static_cast<std::size_t>(database_->execAndGet("SELECT records FROM record_count").getInt64());
    });
}

/// Runs work within a transaction. When this returns, the changes are on the disk.
template <class Work>
auto SqliteStore::changing(Work work) {
    const std::lock_guard lock(mutex_);
    return guarded([&] {
        // Immediate: a transaction that starts by reading cannot be upgraded after another writer.
        SQLite::Transaction transaction(*database_, SQLite::TransactionBehavior::IMMEDIATE);
        if (guard_) guard_(StoreUse::changing);
        auto result = work();
        transaction.commit();
        ++changes_;
        return result;
    });
}

PutOutcome SqliteStore::put(Environment environment, const std::vector<SignedRecord>& records,
                            const Occasion& occasion) {
    return changing([&] {
        if (auto earlier = findRequest(*database_, occasion)) return *std::move(earlier);
        PutOutcome outcome;
        std::string previous = lastEventHash(*database_);
        for (const SignedRecord& entry : records) {
            const Action action = actionOf(environment, entry.record,
                                           standingOf(*database_, environment, entry.record), occasion);
            Record record = entry.record;
            keepEarlierHashes(record, hashesOf(*database_, environment, record.name));
            deleteRecord(*database_, environment, record.name);
            insertRecord(*database_, environment, entry);
            insertHashes(*database_, environment, record);
            const Event event = makeEvent(environment, entry, action, occasion, std::move(previous));
            insertEvent(*database_, event);
            previous = event.hash;
            if (outcome.event.hash.empty()) outcome.event = event;
        }
        if (!records.empty()) keepRequest(*database_, occasion, outcome.event, records.front().ticket);
        return outcome;
    });
}

StoreFacts SqliteStore::facts() {
    return reading([&] {
        // Events are never removed, so the last one's position is their number.
        SQLite::Statement row(
            *database_, "SELECT records, (SELECT ifnull(max(position), 0) FROM event) FROM record_count");
        row.executeStep();
        return StoreFacts{static_cast<std::uint64_t>(row.getColumn(0).getInt64()),
                          static_cast<std::uint64_t>(row.getColumn(1).getInt64()), std::nullopt};
    });
}

void SqliteStore::noteRefusal(const RefusedAttempt& attempt, const Occasion& occasion) {
    changing([&] {
        insertEvent(*database_, makeEvent(attempt, occasion, lastEventHash(*database_)));
        return true;
    });
}

RecordPage SqliteStore::search(const RecordSearch& search) {
    return reading([&] { return searchRecords(*database_, search); });
}

EventPage SqliteStore::search(const EventSearch& search) {
    return reading([&] { return searchEvents(*database_, search); });
}

std::optional<Record> SqliteStore::find(Environment environment, const std::string& recordName) {
    return reading([&]() -> std::optional<Record> {
        SQLite::Statement row(*database_, std::string(kRecordColumns) + "WHERE environment = ? AND name = ?");
        row.bind(1, environmentText(environment));
        row.bind(2, recordName);
        if (!row.executeStep()) return std::nullopt;
        return readRecord(*database_, environment, row);
    });
}

std::vector<Record> SqliteStore::list(Environment environment) {
    return reading([&] {
        SQLite::Statement row(*database_,
                              std::string(kRecordColumns) + "WHERE environment = ? ORDER BY name");
        row.bind(1, environmentText(environment));
        std::vector<Record> records;
        while (row.executeStep()) records.push_back(readRecord(*database_, environment, row));
        return records;
    });
}

void SqliteStore::forEachEvent(const EventQuery& query, const std::function<void(const Event&)>& visit) {
    reading([&] {
        SQLite::Statement row(*database_, std::string("SELECT ") + kEventColumns +
                                              " FROM event WHERE (?1 IS NULL OR record = ?1)"
                                              " AND (?2 IS NULL OR time >= ?2) ORDER BY position");
        if (query.record) row.bind(1, *query.record);
        if (query.since) row.bind(2, query.since->seconds);
        while (row.executeStep()) visit(readEvent(row));
    });
}

void SqliteStore::walkHistory(const HistoryVisitor& visitor) {
    reading([&] {
        const SQLite::Transaction snapshot(*database_);  // both walks see one state; rolled back at the end
        walkEvents(*database_, visitor.event);

        SQLite::Statement records(
            *database_,
            "SELECT r.environment, r.name, r.ticket, r.revoked, e.ticket, e.action FROM record r"
            " LEFT JOIN event e ON e.position = (SELECT position FROM event"
            " WHERE environment = r.environment AND record = r.name AND action <> 'refused'"
            " ORDER BY position DESC LIMIT 1)");
        while (records.executeStep()) {
            RecordState state;
            state.environment =
                parseEnvironment(records.getColumn(0).getString()).value_or(Environment::production);
            state.name = records.getColumn(1).getString();
            state.ticket = base::toHex(crypto::sha256(bytesOf(records.getColumn(2))));
            state.revoked = records.getColumn(3).getInt() != 0;
            if (!records.getColumn(4).isNull()) {
                state.lastTicket = records.getColumn(4).getString();
                state.lastAction = parseAction(records.getColumn(5).getString());
            }
            visitor.record(state);
        }
    });
}

std::string SqliteStore::headHash() {
    return reading([&] { return lastEventHash(*database_); });
}

void SqliteStore::walkContents(const ContentsVisitor& visitor) {
    reading([&] {
        const SQLite::Transaction snapshot(*database_);  // rolled back at the end
        walkEvents(*database_, visitor.event);

        SQLite::Statement records(*database_,
                                  "SELECT name, label, revoked, signed_at, asset IS NOT NULL, ticket,"
                                  " environment FROM record ORDER BY environment, name");
        while (records.executeStep()) {
            const std::string text = records.getColumn(6).getString();
            const Environment environment = parseEnvironment(text).value_or(Environment::production);
            visitor.record(environment,
                           {readRecord(*database_, environment, records), bytesOf(records.getColumn(5))});
        }
    });
}

void SqliteStore::holdStill(const std::function<void(const std::function<void()>& confirm)>& work) {
    guarded([&] {
        // A separate connection: readers continue beside a writer, also in this process.
        SQLite::Database writer(path_, SQLite::OPEN_READWRITE, kBusyTimeoutMilliseconds);
        const SQLite::Transaction transaction(writer, SQLite::TransactionBehavior::IMMEDIATE);
        work([] {});
    });
}

}  // namespace pinwell::lumora
