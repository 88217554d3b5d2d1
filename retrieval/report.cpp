#include "retrieval/report.h"

#include <algorithm>
#include <nlohmann/json.hpp>

#include "foundation/format.h"

namespace pinwell::retrieval {
namespace {

using Json = nlohmann::ordered_json;

constexpr const char* kGreen = "\x1b[32m";
constexpr const char* kRed = "\x1b[31m";
constexpr const char* kPlain = "\x1b[0m";

Json orNull(std::string_view text) {
    return text.empty() ? Json(nullptr) : Json(text);
}

// The name of the operation in the messages of `pinwell`; operations that it lacks keep their own name.
std::string_view actionOf(std::string_view operation) {
    return operation == "staple" || operation == "attach" ? "staple and validate" : operation;
}

// The last message of `pinwell` for a run that reaches it; otherwise the message that it would print.
std::string lastWords(const Report& report) {
    const auto isNews = [](const std::string& message) { return !message.starts_with("Processing: "); };
    const auto last = std::find_if(report.messages.rbegin(), report.messages.rend(), isNews);
    const bool wasCutShort = report.cause == Cause::timedOut || report.cause == Cause::interrupted;
    if (last != report.messages.rend() && !wasCutShort) return *last;
    const std::string action(actionOf(report.operation));
    if (report.cause == Cause::worked) return foundation::format("The %@ action worked!", action);
    return foundation::format("The %@ action failed! Error %d.", action, report.exitStatus);
}

}  // namespace

std::string asJson(const Report& report) {
    Json json = {{"path", orNull(report.path)},         {"operation", report.operation},
                 {"kind", orNull(nameOf(report.kind))}, {"recordName", orNull(report.recordName)},
                 {"exitStatus", report.exitStatus},     {"cause", nameOf(report.cause)},
                 {"attempts", report.attempts},         {"seconds", report.seconds},
                 {"messages", report.messages}};
    if (report.file) json["file"] = *report.file;
    if (report.action) json["action"] = *report.action;
    if (report.event) json["event"] = *report.event;
    return json.dump(-1, ' ', false, Json::error_handler_t::replace);
}

std::string asText(const Report& report, bool isVerbose, bool inColor) {
    std::string text;
    if (isVerbose)
        for (const std::string& message : report.messages) text += "  " + message + "\n";
    const bool worked = report.cause == Cause::worked;
    text += foundation::escapeForTerminal(report.path.empty() ? report.recordName : report.path) + ": ";
    if (inColor) text += worked ? kGreen : kRed;
    text += lastWords(report);
    if (!worked) text += " (" + std::string(nameOf(report.cause)) + ")";
    if (inColor) text += kPlain;
    return text;
}

}  // namespace pinwell::retrieval
