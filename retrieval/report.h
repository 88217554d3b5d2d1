// What there is to say of an artefact, or of a record, that has ended: for people and for programs.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "retrieval/artefact_run.h"
#include "retrieval/cause.h"

namespace pinwell::retrieval {

struct Report {
    std::string path;            // as given; empty if there is a record's name alone
    std::string_view operation;  // "staple", "fetch" and so on
    Kind kind = Kind::none;
    std::string recordName;  // empty if it is not known
    int exitStatus = 0;
    Cause cause = Cause::worked;
    unsigned attempts = 0;  // 0: it was not begun
    double seconds = 0;
    std::vector<std::string> messages;

    /// A file that was written, or would have been; in JSON only if it is set.
    std::optional<std::string> file{};

    /// What the service did for a request, and the hash of its log's entry; in JSON only if they are set.
    std::optional<std::string> action{};
    std::optional<std::string> event{};
};

/// One line of JSON, without its newline, as docs/batch.schema.json and docs/ticket.schema.json have it.
/// Bytes that are no UTF-8 become U+FFFD.
std::string asJson(const Report& report);

/// One line, without its newline, in the words of `pinwell`; in verbose mode all of them before it. Control
/// characters are escaped.
std::string asText(const Report& report, bool isVerbose, bool inColor);

}  // namespace pinwell::retrieval
