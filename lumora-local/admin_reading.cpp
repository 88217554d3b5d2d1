#include <algorithm>
#include <charconv>

#include "admin_routes.h"
#include "admin_service.h"
#include "base/text.h"
#include "record_name.h"
#include "rfc3339.h"
#include "values/format.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using values::Array;
using values::Dictionary;
using values::format;
using values::Value;

constexpr std::size_t kMaximumName = 255;
constexpr std::size_t kMaximumTime = 64;
constexpr std::size_t kMaximumCursor = 512;

[[noreturn]] void refuse(std::string_view parameter, std::string_view what) {
    throw Refused(400, format("the parameter \"%s\" %s", parameter, what));
}

/// `nullopt` if it is not there.
std::optional<std::string> parameter(const Query& query, const char* name, std::size_t most) {
    const auto found = query.find(name);
    if (found == query.end()) return std::nullopt;
    if (found->second.empty()) refuse(name, "is empty");
    if (found->second.size() > most) refuse(name, format("has more than %zu bytes", most));
    return found->second;
}

bool isPrintable(std::string_view text) {
    return std::all_of(text.begin(), text.end(), [](char c) { return c > ' ' && c < '\x7f'; });
}

template <class Number>
std::optional<Number> numberIn(std::string_view text) {
    Number number = 0;
    const char* const end = text.data() + text.size();
    const auto [rest, error] = std::from_chars(text.data(), end, number);
    if (error != std::errc{} || rest != end) return std::nullopt;
    return number;
}

std::size_t limitOf(const Query& query) {
    const auto text = parameter(query, "limit", 8);
    if (!text) return kDefaultPage;
    const auto limit = numberIn<std::size_t>(*text);
    if (!limit || *limit == 0 || *limit > kMaximumPage)
        refuse("limit", format("is no number from 1 to %zu", kMaximumPage));
    return *limit;
}

Environment environmentOf(const Query& query) {
    const auto text = parameter(query, "environment", 16);
    if (!text) return Environment::production;
    const std::optional<Environment> environment = parseEnvironment(*text);
    if (!environment) refuse("environment", "is neither production nor development");
    return *environment;
}

Data hashOf(const std::string& text) {
    if (const std::optional<CodeHash> named = parseRecordName(text)) return named->hash;
    std::optional<Data> bytes = base::parseHex(text);
    if (!bytes || (bytes->size() != hashLength(2) && bytes->size() != hashLength(4)))
        refuse("hash", "is neither 40 nor 96 lower-case hexadecimal digits, nor a record's name");
    return *std::move(bytes);
}

RecordCursor recordCursorIn(const std::string& text) {
    const std::size_t colon = text.find(':');
    const auto label = base::parseHex(std::string_view(text).substr(0, std::min(colon, text.size())));
    if (colon == std::string::npos || !label) refuse("after", "is not what a page gave as \"next\"");
    RecordCursor cursor{base::toString(*label), text.substr(colon + 1)};
    if (cursor.name.empty() || !isPrintable(cursor.name))
        refuse("after", "is not what a page gave as \"next\"");
    return cursor;
}

EventCursor eventCursorIn(const std::string& text) {
    const std::size_t colon = std::min(text.find(':'), text.size());
    const auto time = numberIn<std::int64_t>(std::string_view(text).substr(0, colon));
    const auto position =
        numberIn<std::int64_t>(std::string_view(text).substr(std::min(colon + 1, text.size())));
    if (!time || !position || *position < 0) refuse("after", "is not what a page gave as \"next\"");
    return {*time, *position};
}

Value asValue(const FoundRecord& found, Environment environment) {
    Array hashes;
    for (const CodeHash& hash : found.record.hashes) hashes.emplace_back(recordName(hash));
    return Dictionary{
        {"record", found.record.name},          {"label", base::escapeForDisplay(found.record.label)},
        {"environment", toString(environment)}, {"revoked", found.record.revoked},
        {"asset", found.record.asAsset},        {"signed", toRfc3339(found.record.signedAt)},
        {"hashes", std::move(hashes)},          {"hashesCut", found.hashesCut}};
}

Answer findRecords(RecordStore& store, const AdminRequest& request) {
    const RecordSearch search = recordSearchOf(request.query);
    const RecordPage page = store.search(search);
    Array records;
    for (const FoundRecord& found : page.records) records.push_back(asValue(found, search.environment));
    const Value next = page.next ? Value(toString(*page.next)) : Value(Value::Null());
    const auto document = values::serializeJSON(Dictionary{{"records", std::move(records)}, {"next", next}});
    if (!document) throw Failure(EX_SOFTWARE, document.error().localizedDescription());
    Answer answer;
    answer.body = base::toString(*document);
    return answer;
}

/// The events are written as `log --json` writes them.
Answer listEvents(RecordStore& store, const AdminRequest& request) {
    const EventPage page = store.search(eventSearchOf(request.query));
    Answer answer;
    answer.body = "{\"events\":[";
    std::string_view separator;
    for (const Event& event : page.events) {
        answer.body += separator;
        answer.body += eventAsJson(event);
        separator = ",";
    }
    answer.body += "],\"next\":" + (page.next ? '"' + toString(*page.next) + '"' : std::string("null")) + "}";
    return answer;
}

}  // namespace

std::string toString(const RecordCursor& cursor) {
    return base::toHex(base::asBytes(cursor.label)) + ":" + cursor.name;
}

std::string toString(const EventCursor& cursor) {
    return std::to_string(cursor.time) + ":" + std::to_string(cursor.position);
}

RecordSearch recordSearchOf(const Query& query) {
    RecordSearch search;
    search.environment = environmentOf(query);
    search.limit = limitOf(query);
    search.name = parameter(query, "name", kMaximumName);
    search.label = parameter(query, "label", kSearchedLabelBytes);
    const auto hash = parameter(query, "hash", kMaximumName);
    if (hash) search.hash = hashOf(*hash);
    if (search.name && !isPrintable(*search.name)) refuse("name", "has characters that no name has");
    if (int{search.name.has_value()} + int{search.label.has_value()} + int{hash.has_value()} > 1)
        throw Refused(400, "at most one of \"name\", \"label\" and \"hash\" can be given");
    if (const auto after = parameter(query, "after", kMaximumCursor)) search.after = recordCursorIn(*after);
    return search;
}

EventSearch eventSearchOf(const Query& query) {
    EventSearch search;
    search.environment = environmentOf(query);
    search.limit = limitOf(query);
    search.record = parameter(query, "record", kMaximumName);
    if (search.record && !isPrintable(*search.record)) refuse("record", "has characters that no name has");
    if (!search.record && query.contains("environment")) refuse("environment", "goes with \"record\"");
    if (const auto since = parameter(query, "since", kMaximumTime)) {
        search.since = parseRfc3339(*since);
        if (!search.since) refuse("since", "is no time: 2026-11-20 or 2026-11-20T19:55:00Z");
    }
    if (const auto after = parameter(query, "after", kMaximumCursor)) search.after = eventCursorIn(*after);
    return search;
}

AdminRoutes readingRoutes(RecordStore& store) {
    return {{"GET",
             "/v1/records",
             &Rights::read,
             {"name", "label", "hash", "environment", "limit", "after"},
             [&store](const AdminRequest& request) { return findRecords(store, request); }},
            {"GET",
             "/v1/events",
             &Rights::read,
             {"record", "since", "environment", "limit", "after"},
             [&store](const AdminRequest& request) { return listEvents(store, request); }}};
}

}  // namespace pinwell::lumora
