// The log of a service, shown and checked.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "lumora-local/record_store.h"

namespace pinwell::lumora {

using TextSink = std::function<void(std::string_view)>;

/// Hands the selected events to `sink`, oldest first: for people one line each (describeEvent), or one JSON
/// document
/// {"events": [...]}. Throws Failure.
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
