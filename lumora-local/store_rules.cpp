#include "store_rules.h"

#include <algorithm>
#include <set>

#include "base/text.h"
#include "crypto/crypto.h"
#include "failure.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

constexpr const char* kWayBack = "nothing was issued. To make it valid again: --reinstate --comment TEXT";

[[noreturn]] void refuse(const Record& record) {
    throw RevokedFailure(values::format("record %@ (%@) is revoked; %s", record.name, record.label, kWayBack),
                         record.name);
}

[[noreturn]] void refuse(Environment environment, const Record& record, const RevokedElsewhere& other) {
    std::string revoked = other.name;
    if (other.environment != environment) revoked += values::format(" (%s)", toString(other.environment));
    const std::string text =
        values::format("record %@ (%@) would make software of the revoked record %@ valid; %s", record.name,
                       record.label, revoked, kWayBack);
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
                values::format("the tickets of the record %@ would list more than %zu hashes together",
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
    event.ticket = base::toHex(crypto::sha256(entry.ticket));
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

std::string endOfPrefix(std::string prefix) {
    while (!prefix.empty() && prefix.back() == '\xFF') prefix.pop_back();
    if (!prefix.empty()) prefix.back() = static_cast<char>(static_cast<unsigned char>(prefix.back()) + 1U);
    return prefix;
}

SearchRange rangeOf(const RecordSearch& search) {
    constexpr const char* kAfterEveryName = "\x7f";
    SearchRange range;
    if (search.label) {
        range.firstLabel = search.after ? std::max(search.after->label, *search.label) : *search.label;
        range.endLabel = endOfPrefix(*search.label);
        if (search.after) range.firstName = search.after->name;
        return range;
    }
    const std::string prefix = search.name.value_or("");
    range.firstName = prefix;
    if (search.after) range.firstName = std::max(prefix, search.after->name + '\x01');
    range.endName = prefix.empty() ? kAfterEveryName : endOfPrefix(prefix);
    return range;
}

std::string searchedBytes(const std::string& label) {
    return label.substr(0, kSearchedLabelBytes);
}

RecordPage makePage(std::vector<FoundRecord> records, std::size_t limit, bool byLabel) {
    RecordPage page{std::move(records), std::nullopt};
    if (page.records.size() <= limit) return page;
    page.records.resize(limit);
    const Record& last = page.records.back().record;
    page.next = RecordCursor{byLabel ? searchedBytes(last.label) : std::string(), last.name};
    return page;
}

FoundRecord cutHashes(Record record) {
    const bool cut = record.hashes.size() > kHashesInSearch;
    if (cut) record.hashes.resize(kHashesInSearch);
    return {std::move(record), cut};
}

std::size_t EventPageMaker::rows() const noexcept {
    return (filtersTime() ? kEventsReadForAPage : search_.limit) + 1;
}

bool EventPageMaker::take(Event event, std::int64_t position) {
    if (page_.events.size() == search_.limit || ++read_ == rows()) {
        page_.next = last_;  // this row is the first of the next page
        return false;
    }
    last_ = {event.time.seconds, position};
    if (!filtersTime() || event.time.seconds >= search_.since->seconds)
        page_.events.push_back(std::move(event));
    return true;
}

}  // namespace pinwell::lumora
