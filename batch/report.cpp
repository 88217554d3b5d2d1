#include "batch/report.h"

#include <algorithm>
#include <nlohmann/json.hpp>

#include "foundation/format.h"
#include "src/DownloadDelegate.h"

namespace pinwell::batch {
namespace {

using Json = nlohmann::ordered_json;
using retrieval::Cause;

constexpr const char* kGreen = "\x1b[32m";
constexpr const char* kRed = "\x1b[31m";
constexpr const char* kPlain = "\x1b[0m";

std::string dumped(const Json& json) {
    return json.dump(-1, ' ', false, Json::error_handler_t::replace);
}

Json orNull(std::string_view text) {
    return text.empty() ? Json(nullptr) : Json(text);
}

// What `pinwell` says last of a run that gets that far; of others, what it would have said.
std::string lastWords(const Report& report) {
    const auto isNews = [](const std::string& message) { return !message.starts_with("Processing: "); };
    const auto last = std::find_if(report.messages.rbegin(), report.messages.rend(), isNews);
    const bool wasCutShort = report.cause == Cause::timedOut || report.cause == Cause::interrupted;
    if (last != report.messages.rend() && !wasCutShort) return *last;
    return foundation::format("The %@ action failed! Error %d.",
                              report.operation == kOperationStaple ? "staple and validate" : "validate",
                              report.exitStatus);
}

}  // namespace

void Summary::count(const Report& report) {
    ++total;
    ++byCause.at(static_cast<std::size_t>(report.cause));
    exitStatus = retrieval::worseStatus(exitStatus, report.exitStatus);
}

std::string_view nameOfOperation(std::uint8_t operation) noexcept {
    return operation == kOperationStaple ? "staple" : "validate";
}

std::string asJson(const Report& report) {
    return dumped({{"path", report.path},
                   {"operation", nameOfOperation(report.operation)},
                   {"kind", orNull(nameOf(report.kind))},
                   {"recordName", orNull(report.recordName)},
                   {"exitStatus", report.exitStatus},
                   {"cause", nameOf(report.cause)},
                   {"attempts", report.attempts},
                   {"seconds", report.seconds},
                   {"messages", report.messages}});
}

std::string asJson(const Summary& summary) {
    Json causes = Json::object();
    for (const Cause cause : retrieval::allCauses())
        if (const auto number = summary.numberOf(cause); number > 0)
            causes[std::string(nameOf(cause))] = number;
    const auto worked = summary.numberOf(Cause::worked);
    return dumped({{"summary",
                    {{"version", 1},
                     {"operation", nameOfOperation(summary.operation)},
                     {"total", summary.total},
                     {"worked", worked},
                     {"failed", summary.total - worked},
                     {"resumed", summary.resumed},
                     {"duplicates", summary.duplicates},
                     {"causes", causes},
                     {"exitStatus", summary.exitStatus},
                     {"seconds", summary.seconds}}}});
}

std::string asText(const Report& report, bool isVerbose, bool inColor) {
    std::string text;
    if (isVerbose)
        for (const std::string& message : report.messages) text += "  " + message + "\n";
    const bool worked = report.cause == Cause::worked;
    text += foundation::escapeForTerminal(report.path) + ": ";
    if (inColor) text += worked ? kGreen : kRed;
    text += lastWords(report);
    if (!worked) text += " (" + std::string(nameOf(report.cause)) + ")";
    if (inColor) text += kPlain;
    return text;
}

std::string asText(const Summary& summary) {
    std::string text = std::to_string(summary.total) + (summary.total == 1 ? " artefact" : " artefacts");
    const char* separator = ": ";
    for (const Cause cause : retrieval::allCauses()) {
        const std::uint64_t number = summary.numberOf(cause);
        if (number == 0) continue;
        text += separator + std::to_string(number) + " " + std::string(nameOf(cause));
        separator = ", ";
    }
    if (summary.resumed > 0) text += foundation::format("; %llu done before", summary.resumed);
    if (summary.duplicates > 0) text += foundation::format("; %llu named twice", summary.duplicates);
    const auto tenths = static_cast<std::uint64_t>(summary.seconds * 10 + 0.5);
    return text + foundation::format("; %llu.%llu s", tenths / 10, tenths % 10);
}

}  // namespace pinwell::batch
