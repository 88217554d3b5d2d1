#include "postgres_store.h"

#include <algorithm>
#include <chrono>

#include "failure.h"
#include "postgres_tables.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using std::chrono::milliseconds;
using values::format;
using Clock = std::chrono::steady_clock;

constexpr std::chrono::seconds kReadingTime{5};
constexpr std::chrono::seconds kUpgradeTime{600};
constexpr milliseconds kSilence{120'000};  // between two rows of a walk; the first may need sorting

constexpr const char* kBeginWalk =
    "BEGIN ISOLATION LEVEL REPEATABLE READ READ ONLY; SET LOCAL statement_timeout = 0";

Failure cannotUse(const PostgresPlace& place, std::string_view why) {
    return {EX_CONFIG, format("%@: %@", place.named, why)};
}

/// From the columns `asset, length(ticket), ticket`, starting at `column`; the last may be NULL for an asset.
Delivery readDelivery(const PostgresRows& rows, std::size_t row, int column) {
    Delivery delivery;
    if (rows.isNull(row, column)) {
        delivery.inlineTicket = base::toData(rows.bytes(row, column + 2));
    } else {
        delivery.asset = Delivery::Asset{rows.text(row, column),
                                         static_cast<std::uint64_t>(rows.integer(row, column + 1))};
    }
    return delivery;
}

/// Refuses a server that the role cannot use.
void checkServer(PostgresConnection& connection, const PostgresPlace& place) {
    const std::string encoding = connection.setting("server_encoding");
    if (encoding != "UTF8") {
        throw cannotUse(place, format("the database's encoding is %@, not UTF8", encoding));
    }
    if (!place.forLookups && connection.setting("in_hot_standby") == "on") {
        throw cannotUse(place,
                        "the database is a replica, which cannot be written; it fits \"role\": \"lookup\"");
    }
}

void bringForward(PostgresConnection& connection, const PostgresPlace& place) {
    const Deadline deadline = Clock::now() + kUpgradeTime;
    const std::optional<int> version = postgresVersion(connection, deadline);
    if (!version) {
        throw cannotUse(place, "the database has no record store; make one with lumora-local migrate");
    }
    if (*version == kPostgresVersion) return;
    if (*version > kPostgresVersion || *version < 0) {
        throw cannotUse(place, format("record store of version %d; this program knows versions 1 to %d",
                                      *version, kPostgresVersion));
    }
    if (place.forLookups) {
        throw cannotUse(place,
                        format("record store of version %d; a service whose role is not lookup brings it "
                               "to version %d",
                               *version, kPostgresVersion));
    }
    connection.execute(kBeginPostgresChange, deadline);
    connection.execute("SET LOCAL statement_timeout = 0", deadline);
    upgradePostgresSchema(connection, deadline);
    connection.execute("COMMIT", deadline);
}

}  // namespace

void PostgresStore::create(const PostgresPlace& place,
                           const std::function<void(const ContentsVisitor&)>& pour) {
    const auto soon = [] { return Clock::now() + kUpgradeTime; };
    try {
        PostgresConnection connection(place.url, Clock::now() + kReadingTime);
        checkServer(connection, place);
        if (postgresVersion(connection, soon()).value_or(0) > kPostgresVersion) {
            bringForward(connection, place);  // reports it
        }
        connection.execute(kBeginPostgresChange, soon());
        connection.execute(
            "SET LOCAL statement_timeout = 0; SET LOCAL lock_timeout = 0;"
            " SET LOCAL idle_in_transaction_session_timeout = 0",
            soon());
        upgradePostgresSchema(connection, soon());
        lockStore(connection, soon());
        if (connection
                .query("SELECT EXISTS (SELECT 1 FROM record) OR EXISTS (SELECT 1 FROM event)", {}, soon())
                .boolean(0, 0)) {
            throw Failure(EX_CANTCREAT,
                          format("%@: the database has a record store that is not empty", place.named));
        }
        PostgresBatch batch;
        std::int64_t events = 0;
        std::int64_t records = 0;
        const auto writeIf = [&](bool wanted) {
            if (wanted) batch.write(connection, soon());
        };
        if (pour) {
            pour({.event =
                      [&](const Event& event) {
                          if (!event.record.empty()) requireName(event.record);  // an attempt may name none
                          batch.add(event, ++events);
                          writeIf(batch.isFull());
                      },
                  .record =
                      [&](Environment environment, const SignedRecord& entry) {
                          requireName(entry.record.name);
                          batch.add(environment, entry);
                          ++records;
                          writeIf(batch.isFull());
                      }});
        }
        writeIf(true);
        connection.query("UPDATE store SET records = $1", {records}, soon());
        connection.execute("COMMIT", soon());
    } catch (const PostgresError& error) {
        throw cannotUse(place, error.what());
    }
}

PostgresStore::PostgresStore(PostgresPlace place, StoreGuard guard)
    : place_(std::move(place)), guard_(std::move(guard)), pool_(place_.url, place_.connections) {
    try {
        const auto connection = pool_.take(Clock::now() + kReadingTime);
        checkServer(*connection, place_);
        bringForward(*connection, place_);
    } catch (const PostgresError& error) {
        throw cannotUse(place_, error.what());
    }
}

PostgresStore::~PostgresStore() = default;

/// Runs work that changes nothing. An idle connection may have been lost long ago: in this case it tries once
/// more, on a new one.
template <class Work>
auto PostgresStore::reading(Work work) {
    if (guard_) guard_(StoreUse::reading);
    const Deadline deadline = Clock::now() + kReadingTime;
    for (bool again = false;; again = true) {
        try {
            const auto connection = pool_.take(deadline);
            return work(*connection, deadline);
        } catch (const PostgresError& error) {
            if (!error.lost() || again) throw asFailure(error);
            pool_.closeIdle();
        }
    }
}

/// Runs work that reads one state of the store for as long as it takes.
template <class Work>
void PostgresStore::walking(Work work) {
    if (guard_) guard_(StoreUse::reading);
    try {
        auto connection = beginWalk();
        work(*connection);
        connection->execute("COMMIT", Clock::now() + kReadingTime);
        connection.keep();
    } catch (const PostgresError& error) {
        pool_.closeIdle();
        throw asFailure(error);
    }
}

PostgresPool::Lease PostgresStore::beginWalk() {
    const Deadline deadline = Clock::now() + kReadingTime;
    for (bool again = false;; again = true) {
        try {
            auto connection = pool_.take(deadline);
            connection.discard();
            connection->execute(kBeginWalk, deadline);
            return connection;
        } catch (const PostgresError& error) {
            if (!error.lost() || again) throw;
            pool_.closeIdle();
        }
    }
}

std::optional<Delivery> PostgresStore::findTicket(Environment environment, const std::string& recordName) {
    if (!canNameARecord(recordName)) return std::nullopt;
    return reading([&](PostgresConnection& connection, Deadline deadline) -> std::optional<Delivery> {
        // The asset's bytes are not read: the response needs only their number.
        const PostgresRows rows = connection.query(
            "SELECT asset, length(ticket), CASE WHEN asset IS NULL THEN ticket END"
            " FROM record WHERE environment = $1 AND name = $2",
            {nameOf(environment), recordName}, deadline);
        if (rows.size() == 0) return std::nullopt;
        return readDelivery(rows, 0, 0);
    });
}

std::vector<std::optional<Delivery>> PostgresStore::findTickets(Environment environment,
                                                                std::span<const std::string> recordNames) {
    if (recordNames.size() == 1) return {findTicket(environment, recordNames.front())};
    std::vector<std::optional<Delivery>> found(recordNames.size());
    PostgresArray names;
    for (const std::string& name : recordNames) {
        if (canNameARecord(name)) {
            names.text(name);
        } else {
            names.null();
        }
    }
    reading([&](PostgresConnection& connection, Deadline deadline) {
        const PostgresRows rows = connection.query(
            "SELECT asked.place, r.asset, length(r.ticket), CASE WHEN r.asset IS NULL THEN r.ticket END"
            " FROM unnest($2::text[]) WITH ORDINALITY AS asked (name, place)"
            " JOIN record r ON r.environment = $1 AND r.name = asked.name",
            {nameOf(environment), names.parameter()}, deadline);
        for (std::size_t row = 0; row < rows.size(); ++row) {
            found.at(static_cast<std::size_t>(rows.integer(row, 0) - 1)) = readDelivery(rows, row, 1);
        }
    });
    return found;
}

std::optional<Data> PostgresStore::findAsset(const std::string& identifier) {
    if (!canNameARecord(identifier)) return std::nullopt;
    return reading([&](PostgresConnection& connection, Deadline deadline) -> std::optional<Data> {
        const PostgresRows rows =
            connection.query("SELECT ticket FROM record WHERE asset = $1 LIMIT 1", {identifier}, deadline);
        if (rows.size() == 0) return std::nullopt;
        return base::toData(rows.bytes(0, 0));
    });
}

std::size_t PostgresStore::countRecords() {
    return reading([&](PostgresConnection& connection, Deadline deadline) {
        const PostgresRows rows = connection.query("SELECT records FROM store", {}, deadline);
        return rows.size() == 1 ? static_cast<std::size_t>(rows.integer(0, 0)) : 0;
    });
}

RecordPage PostgresStore::search(const RecordSearch& search) {
    return reading([&](PostgresConnection& connection, Deadline deadline) {
        return searchRecords(connection, search, deadline);
    });
}

EventPage PostgresStore::search(const EventSearch& search) {
    if (search.record && !canNameARecord(*search.record)) return {};
    return reading([&](PostgresConnection& connection, Deadline deadline) {
        return searchEvents(connection, search, deadline);
    });
}

StoreFacts PostgresStore::facts() {
    const auto [records, events] = reading([](PostgresConnection& connection, Deadline deadline) {
        // Events are never removed, so the last one's position is their number.
        const PostgresRows rows = connection.query(
            "SELECT records, (SELECT coalesce(max(position), 0) FROM event) FROM store", {}, deadline);
        return std::pair(rows.integer(0, 0), rows.integer(0, 1));
    });
    return {static_cast<std::uint64_t>(records), static_cast<std::uint64_t>(events), pool_.opened()};
}

std::optional<Record> PostgresStore::find(Environment environment, const std::string& recordName) {
    if (!canNameARecord(recordName)) return std::nullopt;
    static const std::string sql = std::string("SELECT ") + kPostgresRecordColumns +
                                   " FROM record r WHERE r.environment = $1 AND r.name = $2";
    return reading([&](PostgresConnection& connection, Deadline deadline) -> std::optional<Record> {
        const PostgresRows rows = connection.query(sql.c_str(), {nameOf(environment), recordName}, deadline);
        if (rows.size() == 0) return std::nullopt;
        return readRecord(rows, 0);
    });
}

std::vector<Record> PostgresStore::list(Environment environment) {
    static const std::string sql = std::string("SELECT ") + kPostgresRecordColumns +
                                   " FROM record r WHERE r.environment = $1 ORDER BY r.name";
    std::vector<Record> records;
    walking([&](PostgresConnection& connection) {
        connection.forEachRow(sql.c_str(), {nameOf(environment)}, kSilence,
                              [&](const PostgresRows& rows) { records.push_back(readRecord(rows, 0)); });
    });
    return records;
}

void PostgresStore::forEachEvent(const EventQuery& query, const std::function<void(const Event&)>& visit) {
    if (query.record && !canNameARecord(*query.record)) return;
    static const std::string sql = std::string("SELECT ") + kPostgresEventColumns +
                                   " FROM event WHERE ($1::text IS NULL OR record = $1)"
                                   " AND ($2::bigint IS NULL OR time >= $2) ORDER BY position";
    const PostgresParameter since =
        query.since ? PostgresParameter(query.since->seconds) : PostgresParameter(std::nullopt);
    walking([&](PostgresConnection& connection) {
        connection.forEachRow(sql.c_str(), {query.record, since}, kSilence,
                              [&](const PostgresRows& rows) { visit(readEvent(rows, 0)); });
    });
}

void PostgresStore::walkHistory(const HistoryVisitor& visitor) {
    static const std::string events =
        std::string("SELECT ") + kPostgresEventColumns + " FROM event ORDER BY position";
    constexpr const char* kStates =
        "SELECT r.environment, r.name, encode(sha256(r.ticket), 'hex'), r.revoked, e.ticket, e.action"
        " FROM record r LEFT JOIN LATERAL (SELECT ticket, action FROM event"
        " WHERE environment = r.environment AND record = r.name AND action <> 'refused'"
        " ORDER BY position DESC LIMIT 1) e ON true";
    walking([&](PostgresConnection& connection) {
        connection.forEachRow(events.c_str(), {}, kSilence,
                              [&](const PostgresRows& rows) { visitor.event(readEvent(rows, 0)); });
        connection.forEachRow(kStates, {}, kSilence, [&](const PostgresRows& rows) {
            RecordState state;
            state.environment = parseEnvironment(rows.text(0, 0)).value_or(Environment::production);
            state.name = rows.text(0, 1);
            state.ticket = rows.text(0, 2);
            state.revoked = rows.boolean(0, 3);
            if (!rows.isNull(0, 4)) {
                state.lastTicket = rows.text(0, 4);
                state.lastAction = parseAction(rows.text(0, 5));
            }
            visitor.record(state);
        });
    });
}

std::string PostgresStore::headHash() {
    return reading([](PostgresConnection& connection, Deadline deadline) {
        return lastEventOf(connection, deadline).hash;
    });
}

void PostgresStore::walkContents(const ContentsVisitor& visitor) {
    static const std::string events =
        std::string("SELECT ") + kPostgresEventColumns + " FROM event ORDER BY position";
    static const std::string records =
        std::string("SELECT ") + kPostgresRecordColumns +
        ", r.ticket, r.environment FROM record r ORDER BY r.environment, r.name";
    walking([&](PostgresConnection& connection) {
        connection.forEachRow(events.c_str(), {}, kSilence,
                              [&](const PostgresRows& rows) { visitor.event(readEvent(rows, 0)); });
        connection.forEachRow(records.c_str(), {}, kSilence, [&](const PostgresRows& rows) {
            visitor.record(parseEnvironment(rows.text(0, 7)).value_or(Environment::production),
                           {readRecord(rows, 0), base::toData(rows.bytes(0, 6))});
        });
    });
}

}  // namespace pinwell::lumora
