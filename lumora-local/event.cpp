#include "event.h"

#include <array>
#include <nlohmann/json.hpp>

#include "base/bytes.h"
#include "base/text.h"
#include "crypto/crypto.h"
#include "failure.h"
#include "record_store.h"
#include "rfc3339.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using base::escapeForDisplay;
using values::format;

constexpr std::array kActions{Action::issued, Action::reissued, Action::revoked, Action::reinstated,
                              Action::refused};
constexpr std::array kReasons{Reason::compromised, Reason::superseded, Reason::withdrawn,
                              Reason::unspecified};
constexpr std::size_t kHashDigits = 64;

std::string_view reasonText(const Event& event) {
    return event.reason ? toString(*event.reason) : std::string_view();
}

void append(std::string& text, std::string_view field) {
    text += std::to_string(field.size());
    text += ':';
    text += field;
    text += ',';
}

nlohmann::ordered_json textOrNull(std::string_view text) {
    return text.empty() ? nlohmann::ordered_json(nullptr) : nlohmann::ordered_json(escapeForDisplay(text));
}

}  // namespace

std::string_view toString(Action action) {
    switch (action) {
        case Action::issued:
            return "issued";
        case Action::reissued:
            return "reissued";
        case Action::revoked:
            return "revoked";
        case Action::reinstated:
            return "reinstated";
        case Action::refused:
            return "refused";
    }
    return "issued";
}

std::string_view toString(Reason reason) {
    switch (reason) {
        case Reason::compromised:
            return "compromised";
        case Reason::superseded:
            return "superseded";
        case Reason::withdrawn:
            return "withdrawn";
        case Reason::unspecified:
            return "unspecified";
    }
    return "unspecified";
}

std::optional<Action> parseAction(std::string_view text) {
    for (const Action action : kActions) {
        if (text == toString(action)) return action;
    }
    return std::nullopt;
}

std::optional<Reason> parseReason(std::string_view text) {
    for (const Reason reason : kReasons) {
        if (text == toString(reason)) return reason;
    }
    return std::nullopt;
}

std::vector<std::string> reasonNames() {
    std::vector<std::string> names;
    for (const Reason reason : kReasons) names.emplace_back(toString(reason));
    return names;
}

std::string hashBeforeTheFirstEvent() {
    return std::string(kHashDigits, '0');
}

std::string hashOf(const Event& event) {
    std::string text;
    append(text, event.previous);
    append(text, toRfc3339(event.time));
    append(text, event.actor);
    append(text, toString(event.action));
    append(text, toString(event.environment));
    append(text, event.record);
    append(text, event.label);
    append(text, reasonText(event));
    append(text, event.comment);
    append(text, event.ticket);
    return base::toHex(crypto::sha256(base::asBytes(text)));
}

bool isBlank(std::string_view comment) {
    return comment.find_first_not_of(" \t\r\n") == std::string_view::npos;
}

std::string describeEvent(const Event& event) {
    return format("%s\t%s\t%@\t%s\t%s\t%s\t%s\n", toRfc3339(event.time), toString(event.action), event.record,
                  escapeForDisplay(event.actor), escapeForDisplay(event.label), reasonText(event),
                  escapeForDisplay(event.comment));
}

std::string eventAsJson(const Event& event) {
    nlohmann::ordered_json object{{"time", toRfc3339(event.time)},
                                  {"actor", escapeForDisplay(event.actor)},
                                  {"action", toString(event.action)},
                                  {"record", textOrNull(event.record)},
                                  {"label", escapeForDisplay(event.label)},
                                  {"reason", textOrNull(reasonText(event))},
                                  {"comment", textOrNull(event.comment)},
                                  {"ticket", textOrNull(event.ticket)},
                                  {"previous", event.previous},
                                  {"hash", event.hash}};
    if (event.environment != Environment::production) object["environment"] = toString(event.environment);
    return object.dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace);
}

namespace {

[[noreturn]] void broken(std::size_t number, const Event& event, std::string_view what) {
    throw Failure(EX_CONFIG,
                  format("the log is broken at event %zu (%s %s %@, hash %@): %s", number,
                         toRfc3339(event.time), toString(event.action), event.record, event.hash, what));
}

/// A walk along the chain, event by event.
class ChainCheck {
  public:
    explicit ChainCheck(const std::optional<std::string>& knownHead)
        : knownHead_(knownHead), found_(!knownHead || *knownHead == previous_) {}

    void check(const Event& event) {
        ++count_;
        if (event.previous != previous_) broken(count_, event, "it does not follow the event before it");
        if (event.hash != hashOf(event)) broken(count_, event, "its hash is not that of its fields");
        previous_ = event.hash;
        found_ = found_ || event.hash == *knownHead_;
    }

    HistorySummary finish() const {
        if (!found_) {
            throw Failure(EX_CONFIG,
                          format("the log has no event with the hash %@; its end or more is missing. It has "
                                 "%zu events and ends with %s",
                                 *knownHead_, count_, previous_));
        }
        return {count_, previous_};
    }

  private:
    std::optional<std::string> knownHead_;
    std::string previous_ = hashBeforeTheFirstEvent();
    std::size_t count_ = 0;
    bool found_;
};

void checkRecord(const RecordState& record) {
    const auto wrong = [&](const char* what) {
        throw Failure(EX_CONFIG, format("the log does not fit the record %@ (%s): %s", record.name,
                                        toString(record.environment), what));
    };
    if (!record.lastTicket || !record.lastAction) wrong("no event is about it");
    if (*record.lastTicket != record.ticket) wrong("its ticket is not the one of its last event");
    if ((*record.lastAction == Action::revoked) != record.revoked) {
        wrong("its last event says otherwise whether it is revoked");
    }
}

}  // namespace

void writeEvents(RecordStore& store, const EventQuery& query, bool asJson, const TextSink& sink) {
    if (!asJson) {
        store.forEachEvent(query, [&](const Event& event) { sink(describeEvent(event)); });
        return;
    }
    sink("{\"events\":[");
    std::string_view separator;
    store.forEachEvent(query, [&](const Event& event) {
        sink(separator);
        sink(eventAsJson(event));
        separator = ",";
    });
    sink("]}\n");
}

HistorySummary verifyHistory(RecordStore& store, const std::optional<std::string>& knownHead) {
    ChainCheck chain(knownHead);
    store.walkHistory({.event = [&](const Event& event) { chain.check(event); }, .record = checkRecord});
    return chain.finish();
}

}  // namespace pinwell::lumora
