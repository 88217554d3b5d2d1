// The result of an artefact or a record, with its cause, and the report on it for people and for programs.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "src/PWHashedFile/file_kind.h"

namespace pinwell::retrieval {

/// Why an artefact or a record ended with its result: a closed list, for programs.
enum class Cause : std::uint8_t {
    worked,
    unreachable,    // 68: no connection, no response, or a response that asks to retry later
    untrusted,      // 68: the server is not the record service
    notIssued,      // 65: the service has no ticket for it
    notAcceptable,  // 65: the ticket is refused
    revoked,        // 77
    notReadable,    // 66: the path or the file cannot be read
    notSigned,      // 66: it has no hash to look up
    notWritable,    // 73: the ticket could not be written, or did not read back
    changed,        // 73: it changed during the work
    notStapled,     // 65: no ticket is attached
    unsupported,    // 66: it is of a kind without tickets
    timedOut,       // 68: its time limit, or the limit of all, was reached
    interrupted,    // a signal ended the run first
};

/// All of them, in the order above.
std::span<const Cause> allCauses() noexcept;

/// "worked", "unreachable" and so on, as in JSON.
std::string_view nameOf(Cause cause) noexcept;

/// Whether a retry may help.
bool isCurable(Cause cause) noexcept;

/// Whether it is a verdict on the artefact or the record; false if it was not judged.
bool isVerdict(Cause cause) noexcept;

/// The worse of two exit statuses, in the order 77, 73, 65, 66, 68, 0. Any other status is between 68 and
/// 0.
int worseStatus(int first, int second) noexcept;

/// The result of an artefact.
struct Outcome {
    int exitStatus = 0;
    Cause cause = Cause::worked;
};

/// An executable outside a bundle counts as a bundle, as in the tool.
using Kind = ArtefactKind;

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

/// One line of JSON, without its newline, in the form of docs/batch.schema.json and docs/ticket.schema.json.
/// Bytes outside UTF-8 become U+FFFD.
std::string asJson(const Report& report);

/// One line, without its newline, in the words of `pinwell`; in verbose mode all messages before it. Control
/// characters are escaped.
std::string asText(const Report& report, bool isVerbose, bool inColor);

}  // namespace pinwell::retrieval
