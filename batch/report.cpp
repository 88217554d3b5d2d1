#include "batch/report.h"

#include <algorithm>
#include <nlohmann/json.hpp>

#include "foundation/format.h"
#include "src/DownloadDelegate.h"

namespace pinwell::batch {

using Json = nlohmann::ordered_json;
using retrieval::Cause;

void Summary::count(const Report& report) {
    ++total;
    ++byCause.at(static_cast<std::size_t>(report.cause));
    exitStatus = retrieval::worseStatus(exitStatus, report.exitStatus);
}

bool Summary::holdsVerdictsOnly() const {
    const auto causes = retrieval::allCauses();
    return std::all_of(causes.begin(), causes.end(),
                       [this](Cause cause) { return isVerdict(cause) || numberOf(cause) == 0; });
}

std::string_view nameOfOperation(std::uint8_t operation) noexcept {
    return operation == kOperationStaple ? "staple" : "validate";
}

std::string asJson(const Summary& summary) {
    Json causes = Json::object();
    for (const Cause cause : retrieval::allCauses())
        if (const auto number = summary.numberOf(cause); number > 0)
            causes[std::string(nameOf(cause))] = number;
    const auto worked = summary.numberOf(Cause::worked);
    const Json json = {{"summary",
                        {{"version", 1},
                         {"operation", summary.operation},
                         {"total", summary.total},
                         {"worked", worked},
                         {"failed", summary.total - worked},
                         {"resumed", summary.resumed},
                         {"duplicates", summary.duplicates},
                         {"causes", causes},
                         {"exitStatus", summary.exitStatus},
                         {"seconds", summary.seconds}}}};
    return json.dump();
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
    const auto tenths = static_cast<std::uint64_t>(std::llround(summary.seconds * 10));
    return text + foundation::format("; %llu.%llu s", tenths / 10, tenths % 10);
}

}  // namespace pinwell::batch
