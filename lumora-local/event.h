// The log of a record service: each change of a record, with its time, actor and reason; shown and checked.
//
// Events are never changed or removed. Each event has the hash of the previous one. So a check of the chain
// finds an altered, removed or inserted event. An event's hash is SHA-256 over these fields, in this order,
// each as its length in decimal, a colon, its bytes and a comma:
//
//   previous     the previous event's hash, 64 lower-case hexadecimal digits; 64 zeros for the first event
//   time         RFC 3339 in UTC, whole seconds: 2026-11-20T19:55:00Z
//   actor        a login name, or the name in a client's certificate
//   action       issued, reissued, revoked, reinstated or refused
//   environment  production or development
//   record       the record's name; empty if a refused request named none
//   label        the artefact's name for people
//   reason       compromised, superseded, withdrawn or unspecified for a revocation; else empty
//   comment      free text; may be empty
//   ticket       SHA-256 of the record's new ticket, 64 lower-case hexadecimal digits;
//                empty if refused
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "record_name.h"
#include "values/date.h"

namespace pinwell::lumora {

class RecordStore;
struct EventQuery;

/// The change of a record. `refused`: none; a client without the right, or with an impossible request, tried
/// to change it.
enum class Action { issued, reissued, revoked, reinstated, refused };

/// Why a record was revoked.
enum class Reason { compromised, superseded, withdrawn, unspecified };

std::string_view toString(Action action);
std::string_view toString(Reason reason);

/// `nullopt` for any other text.
std::optional<Action> parseAction(std::string_view text);
std::optional<Reason> parseReason(std::string_view text);

/// All reasons' names, for usage texts.
std::vector<std::string> reasonNames();

struct Event {
    values::Date time;
    std::string actor;
    Action action = Action::issued;
    Environment environment = Environment::production;
    std::string record;
    std::string label;
    std::optional<Reason> reason;  // of a revocation
    std::string comment;
    std::string ticket;    // SHA-256 in hexadecimal; empty if refused
    std::string previous;  // hash of the previous event
    std::string hash;
};

/// Whether a comment has only blanks.
bool isBlank(std::string_view comment);

/// The previous hash of the first event: 64 zeros.
std::string hashBeforeTheFirstEvent();

/// The hash that an event with these fields has; `event.hash` plays no part. Throws Failure if the
/// cryptographic library fails.
std::string hashOf(const Event& event);

/// For people: one line an event, tab-separated: time, action, record, actor, label, reason, comment.
std::string describeEvent(const Event& event);

/// For programs: one JSON object without a line end. `environment` is there if it is not production.
std::string eventAsJson(const Event& event);

using TextSink = std::function<void(std::string_view)>;

/// Hands the selected events to `sink`, oldest first: for people one line each (describeEvent), or one JSON
/// document {"events": [...]}. Throws Failure.
void writeEvents(RecordStore& store, const EventQuery& query, bool asJson, const TextSink& sink);

/// The result of a successful check of the whole history.
struct HistorySummary {
    std::size_t events = 0;
    std::string head;  // hash of the last event
};

/// Walks the chain of events and compares each record with the last event about it. `knownHead` is the hash
/// of an event that must be in the chain, so that a cut end shows. Throws Failure (EX_CONFIG) that names the
/// first event or record that does not fit.
HistorySummary verifyHistory(RecordStore& store, const std::optional<std::string>& knownHead);

}  // namespace pinwell::lumora
