#include <SQLiteCpp/SQLiteCpp.h>

#include <filesystem>
#include <system_error>

#include "base/bytes.h"
#include "base/text.h"
#include "crypto/crypto.h"
#include "failure.h"
#include "file_writing.h"
#include "sqlite_tables.h"
#include "values/date.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using values::format;

constexpr int kCurrentVersion = 3;

constexpr const char* kRecordTables = R"(
    CREATE TABLE record (
        environment TEXT NOT NULL,
        name        TEXT NOT NULL,
        label       TEXT NOT NULL,
        revoked     INTEGER NOT NULL,
        signed_at   INTEGER NOT NULL,   -- seconds since 1970-01-01 UTC
        asset       TEXT,               -- identifier of the asset; NULL: the ticket is delivered inline
        ticket      BLOB NOT NULL,
        PRIMARY KEY (environment, name)
    );
    CREATE INDEX record_by_asset ON record (asset) WHERE asset IS NOT NULL;
    CREATE TABLE hash (
        environment TEXT NOT NULL,
        name        TEXT NOT NULL,
        position    INTEGER NOT NULL,
        algorithm   INTEGER NOT NULL,
        hash        BLOB NOT NULL,
        PRIMARY KEY (environment, name, position),
        FOREIGN KEY (environment, name) REFERENCES record (environment, name) ON DELETE CASCADE
    );
)";

// The number of records, because counting ten million takes seconds. A store of version 2 may have this
// table already. Earlier programs keep the number right too, because the triggers belong to the database.
constexpr const char* kRecordCount = R"(
    CREATE TABLE record_count (records INTEGER NOT NULL);
    INSERT INTO record_count (records) SELECT count(*) FROM record;
    CREATE TRIGGER record_is_added AFTER INSERT ON record
        BEGIN UPDATE record_count SET records = records + 1; END;
    CREATE TRIGGER record_is_removed AFTER DELETE ON record
        BEGIN UPDATE record_count SET records = records - 1; END;
)";

// Since version 2. The triggers stop mistakes; the chain of hashes shows intent.
constexpr const char* kEventTable = R"(
    CREATE TABLE event (
        position    INTEGER PRIMARY KEY AUTOINCREMENT,
        time        INTEGER NOT NULL,   -- seconds since 1970-01-01 UTC
        actor       TEXT NOT NULL,
        action      TEXT NOT NULL,
        environment TEXT NOT NULL,
        record      TEXT NOT NULL,
        label       TEXT NOT NULL,
        reason      TEXT,               -- of a revocation
        comment     TEXT NOT NULL,
        ticket      TEXT NOT NULL,      -- SHA-256 in hexadecimal
        previous    TEXT NOT NULL UNIQUE,
        hash        TEXT NOT NULL UNIQUE
    );
    CREATE INDEX event_by_record ON event (environment, record, position);
    CREATE TRIGGER event_is_not_changed BEFORE UPDATE ON event
        BEGIN SELECT RAISE(ABORT, 'events are never changed'); END;
    CREATE TRIGGER event_is_not_removed BEFORE DELETE ON event
        BEGIN SELECT RAISE(ABORT, 'events are never removed'); END;
)";

// Since version 3: the requests that issued and revoked, to recognise a repetition, and indexes with which
// each search reads only one page. A store of version 2 may have an index of hashes already.
constexpr const char* kRequestTableAndSearches = R"(
    CREATE TABLE request (
        client TEXT NOT NULL,
        key    TEXT NOT NULL,
        digest TEXT NOT NULL,
        made   INTEGER NOT NULL,    -- seconds since 1970-01-01 UTC
        event  TEXT NOT NULL,       -- hash of the event that it made
        ticket BLOB NOT NULL,       -- that it issued; the record may have got another one since
        PRIMARY KEY (client, key)
    );
    CREATE INDEX request_by_time ON request (made);
    DROP INDEX IF EXISTS hash_by_bytes;
    CREATE INDEX hash_by_bytes ON hash (environment, hash, name);
    CREATE INDEX record_by_label ON record (environment, substr(CAST(label AS BLOB), 1, 64), name);
    CREATE INDEX event_by_time ON event (time, position);
)";

int versionOf(SQLite::Database& database) {
    return database.execAndGet("PRAGMA user_version").getInt();
}

void setVersion(SQLite::Database& database) {
    database.exec("PRAGMA user_version = " + std::to_string(kCurrentVersion));
}

/// A copy at the last commit, through a separate connection: the caller's transaction continues.
void keepCopy(const std::string& path, int version) {
    const std::string copy = freeName(path, ".version-" + std::to_string(version));
    writeNewFile(copy, {}, kPrivateFileMode);
    try {
        SQLite::Database reader(path, SQLite::OPEN_READWRITE, kBusyTimeoutMilliseconds);
        SQLite::Statement statement(reader, "VACUUM INTO ?");
        statement.bind(1, copy);
        statement.exec();
    } catch (...) {
        std::error_code ignored;
        std::filesystem::remove(copy, ignored);
        throw;
    }
    flushDirectory(std::filesystem::path(copy).parent_path().string());
}

/// The first events of a store without events: its present records.
void logExistingRecords(SQLite::Database& database) {
    SQLite::Statement row(database,
                          "SELECT environment, name, label, revoked, signed_at, ticket FROM record"
                          " ORDER BY signed_at, environment, name");
    std::string previous = hashBeforeTheFirstEvent();
    while (row.executeStep()) {
        Event event;
        event.environment = parseEnvironment(row.getColumn(0).getString()).value_or(Environment::production);
        event.record = row.getColumn(1).getString();
        event.label = row.getColumn(2).getString();
        event.action = row.getColumn(3).getInt() != 0 ? Action::revoked : Action::issued;
        if (event.action == Action::revoked) event.reason = Reason::unspecified;
        event.time = values::Date{row.getColumn(4).getInt64()};
        event.actor = "lumora-local";
        event.comment = "brought forward from a store without events";
        const SQLite::Column ticket = row.getColumn(5);
        event.ticket = base::toHex(crypto::sha256(
            {static_cast<const std::byte*>(ticket.getBlob()), static_cast<std::size_t>(ticket.getBytes())}));
        event.previous = previous;
        event.hash = hashOf(event);
        insertEvent(database, event);
        previous = event.hash;
    }
}

}  // namespace

void configureSqlite(SQLite::Database& database) {
    database.exec("PRAGMA foreign_keys = ON");
    database.exec("PRAGMA synchronous = FULL");
    // The process may write only in its own directory, and SQLite's temporary files are elsewhere.
    database.exec("PRAGMA temp_store = MEMORY");
}

void createSqliteSchema(SQLite::Database& database) {
    SQLite::Transaction transaction(database);
    database.exec(kRecordTables);
    database.exec(kEventTable);
    database.exec(kRecordCount);
    database.exec(kRequestTableAndSearches);
    setVersion(database);
    transaction.commit();
}

void upgradeSqliteSchema(SQLite::Database& database, const std::string& path) {
    if (versionOf(database) == kCurrentVersion) return;
    SQLite::Transaction transaction(database, SQLite::TransactionBehavior::IMMEDIATE);
    const int version = versionOf(database);  // another process may have been first
    if (version == kCurrentVersion) return;
    if (version != 1 && version != 2) {
        throw Failure(EX_DATAERR,
                      format("%@: record store of version %d; this program knows versions 1 to %d", path,
                             version, kCurrentVersion));
    }
    keepCopy(path, version);
    if (version == 1) {
        database.exec(kEventTable);
        logExistingRecords(database);
    }
    if (!database.tableExists("record_count")) database.exec(kRecordCount);
    database.exec(kRequestTableAndSearches);
    setVersion(database);
    transaction.commit();
}

}  // namespace pinwell::lumora
