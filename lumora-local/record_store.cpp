#include "lumora-local/record_store.h"

#include <algorithm>
#include <set>

#include "foundation/format.h"
#include "lumora-local/failure.h"
#include "lumora-local/sha256.h"

namespace pinwell::lumora {

namespace {

constexpr const char* kWayBack = "nothing was issued. To make it valid again: --reinstate --comment TEXT";

[[noreturn]] void refuse(const Record& record) {
    throw RevokedFailure(
        foundation::format("record %@ (%@) is revoked; %s", record.name, record.label, kWayBack),
        record.name);
}

[[noreturn]] void refuse(Environment environment, const Record& record, const RevokedElsewhere& other) {
    std::string revoked = other.name;
    if (other.environment != environment) revoked += foundation::format(" (%s)", toString(other.environment));
    const std::string text =
        foundation::format("record %@ (%@) would make software of the revoked record %@ valid; %s",
                           record.name, record.label, revoked, kWayBack);
    throw RevokedFailure(text, std::move(revoked));
}

}  // namespace

Action actionOf(Environment environment, const Record& record, const Standing& before,
                const Occasion& occasion) {
    if (record.revoked) return Action::revoked;
    const bool revoked = before.revoked.value_or(false);
    if (!revoked && !before.elsewhere) return before.revoked ? Action::reissued : Action::issued;
    if (occasion.reinstates) return Action::reinstated;
    if (revoked) refuse(record);
    refuse(environment, record, *before.elsewhere);
}

void keepEarlierHashes(Record& record, const std::vector<CodeHash>& earlier) {
    const std::set<CodeHash> listed(record.hashes.begin(), record.hashes.end());
    const std::size_t most = std::max(listed.size(), kMaximumKeptHashes);
    for (const CodeHash& hash : earlier) {
        if (listed.contains(hash)) continue;
        if (record.hashes.size() >= most) {
            throw TooManyHashesFailure(
                foundation::format("the tickets of the record %@ would list more than %zu hashes together",
                                   record.name, kMaximumKeptHashes));
        }
        record.hashes.push_back(hash);
    }
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
