#include "lumora-local/record_store.h"

#include "foundation/format.h"
#include "lumora-local/failure.h"
#include "lumora-local/sha256.h"

namespace pinwell::lumora {

Action actionOf(const Record& record, std::optional<bool> revokedBefore, const Occasion& occasion) {
    if (record.revoked) return Action::revoked;
    if (!revokedBefore) return Action::issued;
    if (!*revokedBefore) return Action::reissued;
    if (!occasion.reinstates) {
        throw RevokedFailure(
            foundation::format("record %@ (%@) is revoked; nothing was issued. To make it valid again: "
                               "--reinstate --comment TEXT",
                               record.name, record.label),
            record.name);
    }
    return Action::reinstated;
}

void refuseToGetAround(const Record& record, const std::string& revoked) {
    throw RevokedFailure(
        foundation::format("record %@ (%@) would make software of the revoked record %@ valid; "
                           "nothing was issued. To make it valid again: --reinstate --comment TEXT",
                           record.name, record.label, revoked),
        revoked);
}

Event makeEvent(Environment environment, const SignedRecord& entry, Action action, const Occasion& occasion,
                std::string previous) {
    Event event;
    event.time = occasion.time;
    event.actor = occasion.actor;
    event.action = action;
    event.environment = environment;
    event.record = entry.record.name;
    event.label = entry.record.label;
    if (action == Action::revoked) event.reason = occasion.reason.value_or(Reason::unspecified);
    event.comment = occasion.comment;
    event.ticket = foundation::toHex(sha256(entry.ticket));
    event.previous = std::move(previous);
    event.hash = hashOf(event);
    return event;
}

Event makeEvent(const RefusedAttempt& attempt, const Occasion& occasion, std::string previous) {
    Event event;
    event.time = occasion.time;
    event.actor = occasion.actor;
    event.action = Action::refused;
    event.environment = attempt.environment;
    event.record = attempt.record;
    event.comment = occasion.comment;
    event.previous = std::move(previous);
    event.hash = hashOf(event);
    return event;
}

}  // namespace pinwell::lumora
