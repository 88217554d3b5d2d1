// Why an artefact or a record ended with its result: a closed list, for programs.
#pragma once

#include <array>
#include <cstdint>
#include <span>
#include <string_view>

namespace pinwell::retrieval {

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

}  // namespace pinwell::retrieval
