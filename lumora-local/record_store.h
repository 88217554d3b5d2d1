// The records of a service and the log of what was done to them. One interface; a database behind it.
//
// Several processes use a store at once: some serve from it while others issue and revoke.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "foundation/bytes.h"
#include "foundation/date.h"
#include "lumora-local/code_hash.h"
#include "lumora-local/environment.h"
#include "lumora-local/event.h"

namespace pinwell::lumora {

/// A ticket as lookups deliver it: inline, or by reference to an asset.
struct Delivery {
    struct Asset {
        std::string identifier;  // one path component: lower-case hexadecimal
        std::uint64_t size = 0;
    };
    std::optional<foundation::Data> inlineTicket;
    std::optional<Asset> asset;
};

/// What answering a lookup needs. Calls may come from any thread, several at a time. They throw when the
/// records cannot be read.
class RecordSource {
  public:
    virtual ~RecordSource() = default;

    virtual std::optional<Delivery> findTicket(Environment environment, const std::string& recordName) = 0;

    /// The ticket behind an asset identifier. A record that is replaced takes its asset along, so a revoked
    /// record's earlier ticket is no longer delivered.
    virtual std::optional<foundation::Data> findAsset(const std::string& identifier) = 0;

    virtual std::size_t countRecords() = 0;

    /// Grows with every change of a record, whoever makes it: what was read after a call is not older than
    /// the state that the result stands for. A change that was acknowledged before the call is part of it.
    /// `nullopt` if the source cannot tell, and then nothing that was read may be used again.
    virtual std::optional<std::uint64_t> changeCounter() { return std::nullopt; }
};

/// What a store tells of itself, for metrics.
struct StoreFacts {
    std::uint64_t records = 0;
    std::uint64_t events = 0;
    std::optional<std::uint64_t> connectionsMade;  // to a database, since the store was opened
};

/// One record with all that is known of it except the ticket.
struct Record {
    std::string name;
    std::string label;             // what was issued, for people: the artefact's file name
    std::vector<CodeHash> hashes;  // what the ticket lists, the artefact's own hash first
    bool revoked = false;
    bool asAsset = false;
    foundation::Date signedAt;
};

struct SignedRecord {
    Record record;
    foundation::Data ticket;
};

/// Who changes records, when and why. Becomes part of each event.
struct Occasion {
    foundation::Date time;
    std::string actor;
    std::optional<Reason> reason;  // of a revocation
    std::string comment;
    bool reinstates = false;  // a valid ticket may take the place of a revoked one
};

/// A record beside the last event about it, for checks.
struct RecordState {
    Environment environment = Environment::production;
    std::string name;
    std::string ticket;  // SHA-256 of the ticket in hexadecimal
    bool revoked = false;
    std::optional<std::string> lastTicket;  // what the last event says; `nullopt` if there is no event
    std::optional<Action> lastAction;
};

/// Hears of every event, oldest first, and then of every record. An exception ends the walk.
struct HistoryVisitor {
    std::function<void(const Event&)> event;
    std::function<void(const RecordState&)> record;
};

/// Takes the whole contents of a store: every event, oldest first, and then every record, by environment and
/// name.
struct ContentsVisitor {
    std::function<void(const Event&)> event;
    std::function<void(Environment, const SignedRecord&)> record;
};

/// What a store is about to do.
enum class StoreUse { reading, changing };

/// Is asked before each reading, and within each transaction that changes records, when no other writer can
/// come in between. It throws Failure to forbid it. From any thread.
using StoreGuard = std::function<void(StoreUse)>;

struct EventQuery {
    std::optional<std::string> record;
    std::optional<foundation::Date> since;  // events of this second and later
};

/// Calls may come from any thread, several at a time. They throw Failure.
class RecordStore : public RecordSource {
  public:
    /// Puts all records into the store, each in the place of an earlier record of its name, and appends an
    /// event for each, in one transaction; or changes nothing. A valid ticket for a revoked record, or for a
    /// hash that another record has revoked, is refused (EX_DATAERR), unless the occasion reinstates. When
    /// this returns, the change survives a crash.
    virtual void put(Environment environment, const std::vector<SignedRecord>& records,
                     const Occasion& occasion) = 0;

    /// Costs the same however much the store holds.
    virtual StoreFacts facts() = 0;

    virtual std::optional<Record> find(Environment environment, const std::string& recordName) = 0;

    /// In the order of their names.
    virtual std::vector<Record> list(Environment environment) = 0;

    /// Every event that the query selects, oldest first. Memory does not grow with their number.
    virtual void forEachEvent(const EventQuery& query, const std::function<void(const Event&)>& visit) = 0;

    /// All events and all records as of one point in time.
    virtual void walkHistory(const HistoryVisitor& visitor) = 0;

    /// The hash of the last event; hashBeforeTheFirstEvent() if there is none.
    virtual std::string headHash() = 0;

    /// All that the store holds, as of one point in time. Memory does not grow with it.
    virtual void walkContents(const ContentsVisitor& visitor) = 0;

    /// Runs `work`, which may read this store, while nobody can change it. `work` gets a function that throws
    /// if that has ceased to be so.
    virtual void holdStill(const std::function<void(const std::function<void()>& confirm)>& work) = 0;
};

/// What putting `record` does to a record of its name that is there already. Throws Failure (EX_DATAERR) if
/// that would make a revoked record valid and the occasion does not reinstate.
Action actionOf(const Record& record, std::optional<bool> revokedBefore, const Occasion& occasion);

/// Throws the Failure (EX_DATAERR) of a put whose ticket would vouch for what the record `revoked` has
/// revoked.
[[noreturn]] void refuseToGetAround(const Record& record, const std::string& revoked);

/// The event for a put, with its hash.
Event makeEvent(Environment environment, const SignedRecord& entry, Action action, const Occasion& occasion,
                std::string previous);

}  // namespace pinwell::lumora
