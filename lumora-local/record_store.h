// The records of a service and the log of their changes: one interface, with a database behind it.
//
// Several processes use a store at once: some serve from it while others issue and revoke.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "base/bytes.h"
#include "event.h"
#include "failure.h"
#include "record_name.h"
#include "values/date.h"

namespace pinwell::lumora {

/// A ticket as lookups deliver it: inline, or by reference to an asset.
struct Delivery {
    struct Asset {
        std::string identifier;  // one path component: lower-case hexadecimal
        std::uint64_t size = 0;
    };
    std::optional<base::Data> inlineTicket;
    std::optional<Asset> asset;
};

/// The part of a store that lookups need. Calls may come from any thread, several at a time. They throw if
/// the records cannot be read.
class RecordSource {
  public:
    virtual ~RecordSource() = default;

    virtual std::optional<Delivery> findTicket(Environment environment, const std::string& recordName) = 0;

    /// The result of findTicket() for each name, in their order. All results are in memory at once, so the
    /// caller bounds the number of names.
    virtual std::vector<std::optional<Delivery>> findTickets(Environment environment,
                                                             std::span<const std::string> recordNames) {
        std::vector<std::optional<Delivery>> found;
        for (const std::string& name : recordNames) found.push_back(findTicket(environment, name));
        return found;
    }

    /// The ticket of an asset identifier. Replacing a record removes its asset, so a revoked record's earlier
    /// ticket is no longer delivered.
    virtual std::optional<base::Data> findAsset(const std::string& identifier) = 0;

    virtual std::size_t countRecords() = 0;

    /// Grows with every change of a record, by any process. A read after this call returns this state or a
    /// newer one. A change that was acknowledged before the call is part of it. `nullopt` if the source does
    /// not know; then no earlier read may be used again.
    virtual std::optional<std::uint64_t> changeCounter() { return std::nullopt; }
};

/// Facts about a store, for metrics.
struct StoreFacts {
    std::uint64_t records = 0;
    std::uint64_t events = 0;
    std::optional<std::uint64_t> connectionsMade;  // to a database, since the store was opened
};

/// One record with all its data except the ticket.
struct Record {
    std::string name;
    std::string label;             // for people: the artefact's file name
    std::vector<CodeHash> hashes;  // the ticket's, the artefact's own first; then those of earlier tickets
    bool revoked = false;
    bool asAsset = false;
    values::Date signedAt;
};

struct SignedRecord {
    Record record;
    base::Data ticket;
};

/// Identifies the request of a change, so that the store recognises a repetition. It is stored for
/// kRequestLife, from the occasion's time.
struct RequestIdentity {
    std::string client;
    std::string key;     // the client's key for the request; unique only for that client
    std::string digest;  // of the whole request: different for another request
};
inline constexpr std::int64_t kRequestLife = 24 * 60 * 60;  // seconds

/// Actor, time and reason of a change. Becomes part of each event.
struct Occasion {
    values::Date time;
    std::string actor;
    std::optional<Reason> reason;  // of a revocation
    std::string comment;
    bool reinstates = false;  // a valid ticket may replace a revoked one
    std::optional<RequestIdentity> request{};
};

/// The result of a put.
struct PutOutcome {
    Event event;                        // about the first record
    std::optional<base::Data> earlier;  // its ticket, if the same request was carried out before
};

/// A put that would make a revoked record valid.
class RevokedFailure : public Failure {
  public:
    RevokedFailure(const std::string& text, std::string revoked)
        : Failure(EX_DATAERR, text), revoked_(std::move(revoked)) {}

    /// The name of the record that is revoked; with its environment if that is another one.
    const std::string& revoked() const noexcept { return revoked_; }

  private:
    std::string revoked_;
};

/// The highest number of hashes that a record keeps from its earlier tickets and the present one.
inline constexpr std::size_t kMaximumKeptHashes = 65'536;

/// A put that would give a record too many hashes.
class TooManyHashesFailure : public Failure {
  public:
    explicit TooManyHashesFailure(const std::string& text) : Failure(EX_DATAERR, text) {}
};

/// A request under the key of another one.
class ReusedKeyFailure : public Failure {
  public:
    ReusedKeyFailure() : Failure(EX_DATAERR, "the key of the request belongs to another request") {}
};

/// A refused attempt to change a record, which did not reach the store.
struct RefusedAttempt {
    Environment environment = Environment::production;
    std::string record;  // empty if the attempt named none
};

/// A record beside the last event about it, for checks.
struct RecordState {
    Environment environment = Environment::production;
    std::string name;
    std::string ticket;  // SHA-256 of the ticket in hexadecimal
    bool revoked = false;
    std::optional<std::string> lastTicket;  // according to the last event; `nullopt` if there is none
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

/// The next operation of a store.
enum class StoreUse { reading, changing };

/// Called before each reading, and within each transaction that changes records, when no other writer can
/// intervene. Throws Failure to forbid the operation. From any thread.
using StoreGuard = std::function<void(StoreUse)>;

struct EventQuery {
    std::optional<std::string> record;
    std::optional<values::Date> since;  // events of this second and later
};

/// The compared part of a label in a search: bytes from its beginning.
inline constexpr std::size_t kSearchedLabelBytes = 64;

/// The highest number of a record's hashes in a search.
inline constexpr std::size_t kHashesInSearch = 100;

/// After which record a page begins: by the searched bytes of its label in a search by label, and by its
/// name.
struct RecordCursor {
    std::string label;
    std::string name;
    bool operator==(const RecordCursor&) const = default;
};

/// At most one of `name`, `label` and `hash` is there. A search by label is in the order of the labels'
/// searched bytes, then of names; any other in the order of names.
struct RecordSearch {
    Environment environment = Environment::production;
    std::optional<std::string> name;   // its beginning; printable ASCII
    std::optional<std::string> label;  // its beginning; not empty, at most kSearchedLabelBytes bytes
    std::optional<base::Data> hash;    // in the ticket, of any digest type
    std::size_t limit = 0;
    std::optional<RecordCursor> after;
};

struct FoundRecord {
    Record record;           // with at most kHashesInSearch hashes
    bool hashesCut = false;  // it has more
};

struct RecordPage {
    std::vector<FoundRecord> records;
    std::optional<RecordCursor> next;  // `nullopt`: there are no more
};

/// After which event a page begins.
struct EventCursor {
    std::int64_t time = 0;  // seconds since 1970-01-01 UTC
    std::int64_t position = 0;
    bool operator==(const EventCursor&) const = default;
};

/// In the order of the chain; with `since` and without `record`, in the order of time.
struct EventSearch {
    std::optional<std::string> record;
    Environment environment = Environment::production;  // of the record; without one, events of all are found
    std::optional<values::Date> since;                  // events of this second and later
    std::size_t limit = 0;
    std::optional<EventCursor> after;
};

/// A page may have fewer events than the limit even if there is a next page.
struct EventPage {
    std::vector<Event> events;
    std::optional<EventCursor> next;
};

/// Calls may come from any thread, several at a time. They throw Failure.
class RecordStore : public RecordSource {
  public:
    /// Puts all records into the store and appends an event for each, in one transaction; or changes
    /// nothing. A record replaces an earlier record of its name. A valid ticket for a revoked record,
    /// or for a hash that another record has revoked, is refused (RevokedFailure), unless the occasion
    /// reinstates. A ticket does not name its environment. So a revocation in production counts in
    /// every environment, and one in development only there. When this returns, the change survives a
    /// crash.
    ///
    /// A record keeps the hashes of its earlier tickets. So a later revocation covers all of them, even if
    /// the last ticket lists fewer. Throws TooManyHashesFailure beyond kMaximumKeptHashes, unless one ticket
    /// alone lists more.
    ///
    /// If the occasion's request was carried out before, nothing changes, and the outcome is that of
    /// the first time. Throws ReusedKeyFailure if its key belongs to another request. Needs one record.
    virtual PutOutcome put(Environment environment, const std::vector<SignedRecord>& records,
                           const Occasion& occasion) = 0;

    /// Appends an event `refused`, which changes no record.
    virtual void noteRefusal(const RefusedAttempt& attempt, const Occasion& occasion) = 0;

    /// One page of the matching records. The work and memory of a call do not grow with the store.
    virtual RecordPage search(const RecordSearch& search) = 0;

    /// One page of the matching events. The work and memory of a call do not grow with the store.
    virtual EventPage search(const EventSearch& search) = 0;

    /// Costs the same for every size of the store.
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

    /// The whole contents of the store at one point in time. Memory does not grow with them.
    virtual void walkContents(const ContentsVisitor& visitor) = 0;

    /// Runs `work`, which may read this store, while nobody can change it. The argument of `work` is a
    /// function that throws if this is no longer certain.
    virtual void holdStill(const std::function<void(const std::function<void()>& confirm)>& work) = 0;
};

}  // namespace pinwell::lumora
