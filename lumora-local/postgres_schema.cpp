#include <array>
#include <string>

#include "failure.h"
#include "postgres_tables.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

// Instances upgrade one after another under this lock. Nothing else in the database should use this number.
constexpr const char* kTakeTurns = "SELECT pg_advisory_xact_lock(7526467402843185714)";

constexpr const char* kVersionTable = R"(
    CREATE SCHEMA IF NOT EXISTS lumora;
    CREATE TABLE IF NOT EXISTS lumora.store (
        only_row boolean PRIMARY KEY DEFAULT true CHECK (only_row),
        version  integer NOT NULL,
        records  bigint NOT NULL       -- how many there are: counting ten million takes seconds
    );
    INSERT INTO lumora.store (version, records) SELECT 0, 0 WHERE NOT EXISTS (SELECT 1 FROM lumora.store);
)";

// Tickets are mostly signatures, which cannot be compressed.
constexpr const char* kRecordsAndEvents = R"(
    CREATE TABLE record (
        environment text COLLATE "C" NOT NULL,
        name        text COLLATE "C" NOT NULL,
        label       bytea NOT NULL,
        revoked     boolean NOT NULL,
        signed_at   bigint NOT NULL,     -- seconds since 1970-01-01 UTC
        asset       text COLLATE "C",    -- identifier of the asset; NULL: the ticket is delivered inline
        ticket      bytea NOT NULL CHECK (length(ticket) > 0),
        PRIMARY KEY (environment, name)
    );
    ALTER TABLE record ALTER COLUMN ticket SET STORAGE EXTERNAL;
    CREATE INDEX record_by_asset ON record (asset) WHERE asset IS NOT NULL;
    CREATE TABLE hash (
        environment text COLLATE "C" NOT NULL,
        name        text COLLATE "C" NOT NULL,
        position    integer NOT NULL,
        algorithm   bigint NOT NULL,
        hash        bytea NOT NULL,
        PRIMARY KEY (environment, name, position),
        FOREIGN KEY (environment, name) REFERENCES record (environment, name) ON DELETE CASCADE
    );
    CREATE INDEX hash_by_bytes ON hash (environment, hash);
    CREATE TABLE event (
        position    bigint PRIMARY KEY,
        time        bigint NOT NULL,     -- seconds since 1970-01-01 UTC
        actor       bytea NOT NULL,
        action      text COLLATE "C" NOT NULL,
        environment text COLLATE "C" NOT NULL,
        record      text COLLATE "C" NOT NULL,
        label       bytea NOT NULL,
        reason      text COLLATE "C",    -- of a revocation
        comment     bytea NOT NULL,
        ticket      text COLLATE "C" NOT NULL,    -- SHA-256 in hexadecimal
        previous    text COLLATE "C" NOT NULL UNIQUE,
        hash        text COLLATE "C" NOT NULL UNIQUE
    );
    CREATE INDEX event_by_record ON event (environment, record, position);
    -- The triggers stop mistakes; the chain of hashes shows intent.
    CREATE FUNCTION events_stay() RETURNS trigger LANGUAGE plpgsql AS
        $$ BEGIN RAISE EXCEPTION 'events are never changed and never removed'; END $$;
    CREATE TRIGGER events_stay BEFORE UPDATE OR DELETE OR TRUNCATE ON event
        FOR EACH STATEMENT EXECUTE FUNCTION events_stay();
)";

constexpr const char* kRequestsAndSearches = R"(
    -- The requests that issued and revoked, so that their repetition is known.
    CREATE TABLE request (
        client bytea NOT NULL,
        key    text COLLATE "C" NOT NULL,
        digest text COLLATE "C" NOT NULL,
        made   bigint NOT NULL,                 -- seconds since 1970-01-01 UTC
        event  text COLLATE "C" NOT NULL,       -- hash of the event that it made
        ticket bytea NOT NULL,                  -- that it issued; the record may have got another one since
        PRIMARY KEY (client, key)
    );
    CREATE INDEX request_by_time ON request (made);
    -- Indexes by which each search reads a page and no more.
    DROP INDEX IF EXISTS hash_by_bytes;
    CREATE INDEX hash_by_bytes ON hash (environment, hash, name);
    CREATE INDEX record_by_label ON record (environment, substring(label from 1 for 64), name);
    CREATE INDEX event_by_time ON event (time, position);
)";

// From each version to the next.
constexpr std::array<const char*, kPostgresVersion> kSteps{kRecordsAndEvents, kRequestsAndSearches};

constexpr const char* kExists = "SELECT to_regclass('lumora.store') IS NOT NULL";
constexpr const char* kVersion = "SELECT version FROM lumora.store";

}  // namespace

std::optional<int> postgresVersion(PostgresConnection& connection, Deadline deadline) {
    if (!connection.query(kExists, {}, deadline).boolean(0, 0)) return std::nullopt;
    const PostgresRows rows = connection.query(kVersion, {}, deadline);
    if (rows.size() == 0) return 0;
    return static_cast<int>(rows.integer(0, 0));
}

void upgradePostgresSchema(PostgresConnection& connection, Deadline deadline) {
    connection.execute(kTakeTurns, deadline);
    int version = postgresVersion(connection, deadline).value_or(0);
    if (version == 0) connection.execute(kVersionTable, deadline);
    for (; version >= 0 && version < kPostgresVersion; ++version) {
        connection.execute(kSteps.at(static_cast<std::size_t>(version)), deadline);
    }
    connection.execute("UPDATE lumora.store SET version = " + std::to_string(version), deadline);
}

void lockStore(PostgresConnection& connection, Deadline deadline) {
    const PostgresRows rows = connection.query("SELECT version FROM store FOR UPDATE", {}, deadline);
    const std::int64_t version = rows.size() == 1 ? rows.integer(0, 0) : 0;
    if (version != kPostgresVersion) {
        throw Failure(EX_CONFIG,
                      values::format("the record store has become one of version %lld; this program knows "
                                     "versions up to %d",
                                     static_cast<long long>(version), kPostgresVersion));
    }
}

}  // namespace pinwell::lumora
