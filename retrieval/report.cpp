#include "retrieval/report.h"

#include <algorithm>
#include <array>
#include <nlohmann/json.hpp>

#include "base/text.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "values/format.h"

namespace pinwell::retrieval {
namespace {

struct Row {
    Cause cause;
    std::string_view name;
};

constexpr std::array kRows{
    Row{Cause::worked, "worked"},
    Row{Cause::unreachable, "unreachable"},
    Row{Cause::untrusted, "untrusted"},
    Row{Cause::notIssued, "notIssued"},
    Row{Cause::notAcceptable, "notAcceptable"},
    Row{Cause::revoked, "revoked"},
    Row{Cause::notReadable, "notReadable"},
    Row{Cause::notSigned, "notSigned"},
    Row{Cause::notWritable, "notWritable"},
    Row{Cause::changed, "changed"},
    Row{Cause::notStapled, "notStapled"},
    Row{Cause::unsupported, "unsupported"},
    Row{Cause::timedOut, "timedOut"},
    Row{Cause::interrupted, "interrupted"},
};

constexpr std::array<Cause, kRows.size()> causesOfRows() {
    std::array<Cause, kRows.size()> causes{};
    for (std::size_t i = 0; i < kRows.size(); ++i) causes.at(i) = kRows.at(i).cause;
    return causes;
}
constexpr auto kCauses = causesOfRows();

// From the best to the worst.
constexpr std::array kByWeight{
    kExitOK, -1, kExitNoHost, kExitNoInput, kExitDataError, kExitCannotCreate, kExitNoPermission};

std::size_t weightOf(int status) {
    const auto found = std::find(kByWeight.begin(), kByWeight.end(), status);
    return found == kByWeight.end() ? 1 : static_cast<std::size_t>(found - kByWeight.begin());
}

}  // namespace

std::span<const Cause> allCauses() noexcept {
    return kCauses;
}

std::string_view nameOf(Cause cause) noexcept {
    const auto found =
        std::find_if(kRows.begin(), kRows.end(), [cause](const Row& row) { return row.cause == cause; });
    return found == kRows.end() ? std::string_view() : found->name;
}

bool isCurable(Cause cause) noexcept {
    return cause == Cause::unreachable;
}

bool isVerdict(Cause cause) noexcept {
    return cause != Cause::unreachable && cause != Cause::untrusted && cause != Cause::timedOut &&
           cause != Cause::interrupted;
}

int worseStatus(int first, int second) noexcept {
    return weightOf(second) > weightOf(first) ? second : first;
}

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
    if (report.cause == Cause::worked) return values::format("The %@ action worked!", action);
    return values::format("The %@ action failed! Error %d.", action, report.exitStatus);
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
    text += base::escapeForTerminal(report.path.empty() ? report.recordName : report.path) + ": ";
    if (inColor) text += worked ? kGreen : kRed;
    text += lastWords(report);
    if (!worked) text += " (" + std::string(nameOf(report.cause)) + ")";
    if (inColor) text += kPlain;
    return text;
}

}  // namespace pinwell::retrieval
