// The report on a finished artefact or record, for people and for programs.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "retrieval/artefact_run.h"
#include "retrieval/cause.h"

namespace pinwell::retrieval {

struct Report {
    std::string path;            // as given; empty for a record without an artefact
    std::string_view operation;  // "staple", "fetch" and so on
    Kind kind = Kind::none;
    std::string recordName;  // empty if unknown
    int exitStatus = 0;
    Cause cause = Cause::worked;
    unsigned attempts = 0;  // 0: not begun
    double seconds = 0;
    std::vector<std::string> messages;

    /// The file to write, written or not; in JSON only if set.
    std::optional<std::string> file{};

    /// The service's action for a request, and the hash of its log entry; in JSON only if set.
    std::optional<std::string> action{};
    std::optional<std::string> event{};
};

/// One line of JSON, without its newline, as docs/batch.schema.json and docs/ticket.schema.json have it.
/// Bytes outside UTF-8 become U+FFFD.
std::string asJson(const Report& report);

/// One line, without its newline, in the words of `pinwell`; in verbose mode all messages before it. Control
/// characters are escaped.
std::string asText(const Report& report, bool isVerbose, bool inColor);

}  // namespace pinwell::retrieval
