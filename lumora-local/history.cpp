#include "lumora-local/history.h"

#include "foundation/format.h"
#include "lumora-local/failure.h"
#include "lumora-local/rfc3339.h"

namespace pinwell::lumora {
namespace {

using foundation::format;

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
