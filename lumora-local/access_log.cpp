#include "access_log.h"

#include "base/text.h"
#include "rfc3339.h"
#include "values/format.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using values::Array;
using values::Dictionary;
using values::Value;

/// JSON is UTF-8. A client may send other bytes, and control characters, which drive terminals.
std::string printable(std::string_view text) {
    return base::escapeForDisplay(text);
}

/// In quotes that the text cannot end.
std::string inQuotes(std::string_view text) {
    std::string line = "\"";
    for (const char c : text) {
        if (c == '"' || c == '\\') line += '\\';
        line += c;
    }
    return printable(line + '"');
}

std::string jsonLine(Dictionary members) {
    const auto document = values::serializeJSON(Value(std::move(members)));
    return document ? base::toString(*document) : std::string(R"({"level":"error"})");
}

}  // namespace

std::string describeRequest(const RequestEntry& entry, LogForm form) {
    if (form == LogForm::text) {
        std::string line =
            values::format("%@ %s %s %d %zu %s", entry.time, entry.peer,
                           inQuotes(std::string(entry.method) + ' ' + std::string(entry.target)),
                           entry.status, entry.size, entry.identifier);
        if (!entry.client.empty()) line += ' ' + inQuotes(entry.client);
        return line;
    }
    Array records;
    if (entry.records != nullptr) {
        for (const std::string& name : *entry.records) records.emplace_back(printable(name));
    }
    Dictionary members{{"time", toRfc3339(entry.time)},
                       {"level", "info"},
                       {"message", "request"},
                       {"peer", entry.peer},
                       {"method", printable(entry.method)},
                       {"target", printable(entry.target)},
                       {"status", entry.status},
                       {"bytes", std::uint64_t{entry.size}},
                       {"request", entry.identifier},
                       {"records", std::move(records)},
                       {"microseconds", std::int64_t{entry.duration.count()}}};
    if (!entry.client.empty()) members["client"] = printable(entry.client);
    return jsonLine(std::move(members));
}

std::string messageAsJson(values::Date time, std::string_view level, std::string_view message) {
    return jsonLine({{"time", toRfc3339(time)}, {"level", level}, {"message", printable(message)}});
}

}  // namespace pinwell::lumora
