#include "lumora-local/search_page.h"

#include <algorithm>

namespace pinwell::lumora {

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
