// Changes of a store in PostgreSQL: each is one transaction, which survives a lost connection.
#include <chrono>
#include <thread>

#include "failure.h"
#include "postgres_store.h"
#include "postgres_tables.h"
#include "store_rules.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using values::format;
using Clock = std::chrono::steady_clock;

constexpr std::chrono::seconds kChangingTime{20};
constexpr std::chrono::milliseconds kPauseBeforeTryingAgain{100};

std::optional<bool> isRevoked(PostgresConnection& connection, Environment environment,
                              const std::string& name, Deadline deadline) {
    const PostgresRows rows =
        connection.query("SELECT revoked FROM record WHERE environment = $1 AND name = $2",
                         {nameOf(environment), name}, deadline);
    if (rows.size() == 0) return std::nullopt;
    return rows.boolean(0, 0);
}

/// The same rule as in the SQLite store: a hash counts under any name and algorithm. The other hashes of a
/// revoked artefact count if one of them is to get its own ticket.
std::optional<RevokedElsewhere> revokedBeside(PostgresConnection& connection, Environment environment,
                                              const Record& record, Deadline deadline) {
    if (record.hashes.empty()) return std::nullopt;
    PostgresArray hashes;
    for (const CodeHash& hash : record.hashes) hashes.bytes(hash.hash);
    const PostgresRows rows = connection.query(
        "SELECT r.environment, r.name FROM hash h"
        " JOIN record r ON r.environment = h.environment AND r.name = h.name"
        " WHERE h.environment IN ($1, 'production') AND (r.environment <> $1 OR r.name <> $2)"
        " AND r.revoked AND h.hash = ANY ($3::bytea[]) AND (h.hash = $4 OR h.position = 0)"
        " ORDER BY r.name LIMIT 1",
        {nameOf(environment), record.name, hashes.parameter(),
         PostgresParameter::bytes(record.hashes.front().hash)},
        deadline);
    if (rows.size() == 0) return std::nullopt;
    return RevokedElsewhere{parseEnvironment(rows.text(0, 0)).value_or(environment), rows.text(0, 1)};
}

Standing standingOf(PostgresConnection& connection, Environment environment, const Record& record,
                    Deadline deadline) {
    Standing standing{isRevoked(connection, environment, record.name, deadline), std::nullopt};
    if (!record.revoked) standing.elsewhere = revokedBeside(connection, environment, record, deadline);
    return standing;
}

std::vector<CodeHash> hashesOf(PostgresConnection& connection, Environment environment,
                               const std::string& name, Deadline deadline) {
    const PostgresRows rows = connection.query(
        "SELECT algorithm, hash FROM hash WHERE environment = $1 AND name = $2 ORDER BY position",
        {nameOf(environment), name}, deadline);
    std::vector<CodeHash> hashes;
    for (std::size_t row = 0; row < rows.size(); ++row) {
        hashes.push_back(
            {static_cast<std::uint32_t>(rows.integer(row, 0)), base::toData(rows.bytes(row, 1))});
    }
    return hashes;
}

}  // namespace

/// Runs work within a transaction that has the store's lock, and repeats it if the connection is lost. The
/// outcome's event shows whether a commit without a response took place. When this returns, the changes are
/// on the server's disk.
PutOutcome PostgresStore::changing(const std::function<PutOutcome(PostgresConnection&, Deadline)>& work) {
    const Deadline deadline = Clock::now() + kChangingTime;
    for (;;) {
        try {
            auto lease = pool_.take(deadline);
            lease.discard();
            lease->execute(kBeginPostgresChange, deadline);
            lockStore(*lease, deadline);
            if (guard_) guard_(StoreUse::changing);
            PutOutcome outcome = work(*lease, deadline);
            // From here on only the server decides: a time limit would interrupt its wait for a replica that
            // must also have the change.
            lease->execute("SET LOCAL statement_timeout = 0", deadline);
            if (commit(lease, deadline) || wasCommitted(outcome.event.hash, deadline)) return outcome;
        } catch (const PostgresError& error) {
            // Nothing was committed: the transaction failed before the commit.
            const bool another = error.lost() || error.state().starts_with("40");
            if (!another || Clock::now() + kPauseBeforeTryingAgain >= deadline) throw asFailure(error);
            pool_.closeIdle();
        }
        std::this_thread::sleep_for(kPauseBeforeTryingAgain);
    }
}

/// Returns false if the connection was lost: the outcome of the transaction is then unknown.
bool PostgresStore::commit(PostgresPool::Lease& lease, Deadline deadline) {
    try {
        lease->execute("COMMIT", deadline);
    } catch (const PostgresError& error) {
        if (!error.lost()) throw;
        return false;
    }
    lease.keep();
    return true;
}

PutOutcome PostgresStore::put(Environment environment, const std::vector<SignedRecord>& records,
                              const Occasion& occasion) {
    for (const SignedRecord& entry : records) requireName(entry.record.name);
    return changing([&](PostgresConnection& connection, Deadline deadline) {
        if (auto earlier = findRequest(connection, occasion, deadline)) return *std::move(earlier);
        PostgresHead head = lastEventOf(connection, deadline);
        std::int64_t added = 0;
        PutOutcome outcome;
        PostgresBatch batch;
        for (const SignedRecord& entry : records) {
            const Standing before = standingOf(connection, environment, entry.record, deadline);
            const Action action = actionOf(environment, entry.record, before, occasion);
            std::optional<SignedRecord> joined;  // a ticket is copied only with an earlier one in the store
            if (before.revoked) {
                joined = entry;
                keepEarlierHashes(joined->record,
                                  hashesOf(connection, environment, entry.record.name, deadline));
                connection.query("DELETE FROM record WHERE environment = $1 AND name = $2",
                                 {nameOf(environment), entry.record.name}, deadline);
            } else {
                ++added;
            }
            const Event event = makeEvent(environment, entry, action, occasion, std::move(head.hash));
            batch.add(environment, joined ? *joined : entry);
            batch.add(event, ++head.position);
            batch.write(connection, deadline);
            head.hash = event.hash;
            if (outcome.event.hash.empty()) outcome.event = event;
        }
        connection.query("UPDATE store SET records = records + $1", {added}, deadline);
        if (!records.empty())
            keepRequest(connection, occasion, outcome.event, records.front().ticket, deadline);
        return outcome;
    });
}

void PostgresStore::noteRefusal(const RefusedAttempt& attempt, const Occasion& occasion) {
    if (!attempt.record.empty()) requireName(attempt.record);
    changing([&](PostgresConnection& connection, Deadline deadline) {
        PostgresHead head = lastEventOf(connection, deadline);
        PutOutcome outcome{makeEvent(attempt, occasion, std::move(head.hash)), std::nullopt};
        PostgresBatch batch;
        batch.add(outcome.event, head.position + 1);
        batch.write(connection, deadline);
        return outcome;
    });
}

bool PostgresStore::wasCommitted(const std::string& eventHash, Deadline deadline) {
    for (;;) {
        pool_.closeIdle();
        try {
            auto connection = pool_.take(deadline);
            connection.discard();
            connection->execute(kBeginPostgresChange, deadline);
            // With the lock, the earlier transaction is known to be over.
            lockStore(*connection, deadline);
            return connection->query("SELECT 1 FROM event WHERE hash = $1", {eventHash}, deadline).size() > 0;
        } catch (const PostgresError& error) {
            if (Clock::now() + kPauseBeforeTryingAgain >= deadline) {
                throw Failure(
                    EX_TEMPFAIL,
                    format("record store: the database was lost during the commit (%@); whether the "
                           "change was made is not known: lumora-local log shows it",
                           std::string_view(error.what())));
            }
        }
        std::this_thread::sleep_for(kPauseBeforeTryingAgain);
    }
}

void PostgresStore::holdStill(const std::function<void(const std::function<void()>& confirm)>& work) {
    try {
        const auto soon = [] { return Clock::now() + kChangingTime; };
        auto connection = pool_.take(soon());
        connection.discard();
        connection->execute(kBeginPostgresChange, soon());
        connection->execute("SET LOCAL idle_in_transaction_session_timeout = 0", soon());
        lockStore(*connection, soon());
        work([&] { connection->execute("SELECT 1", soon()); });
    } catch (const PostgresError& error) {
        throw asFailure(error);
    }
}

}  // namespace pinwell::lumora
