// Why an artefact or a record ended as it did: a closed list, for programs to go by.
#pragma once

#include <array>
#include <cstdint>
#include <span>
#include <string_view>

namespace pinwell::retrieval {

enum class Cause : std::uint8_t {
    worked,
    unreachable,    // 68: no connection, no answer, or an answer that asks to come back later
    untrusted,      // 68: the server is not the record service
    notIssued,      // 65: the service has no ticket for it
    notAcceptable,  // 65: there is a ticket, and it is refused
    revoked,        // 77
    notReadable,    // 66: the path, or what is there, cannot be read
    notSigned,      // 66: it has no hash to look up
    notWritable,    // 73: the ticket could not be written, or did not read back
    changed,        // 73: it changed while it was worked on
    notStapled,     // 65: it carries no ticket
    unsupported,    // 66: it is of no kind that can carry a ticket
    timedOut,       // 68: its time, or that of all, was up
    interrupted,    // a signal ended the run first
};

/// All of them, in the order above.
std::span<const Cause> allCauses() noexcept;

/// "worked", "unreachable" and so on, as in JSON.
std::string_view nameOf(Cause cause) noexcept;

/// Whether another try may end better.
bool isCurable(Cause cause) noexcept;

/// Whether it says something of the artefact, or of the record; false if nobody got to look.
bool isVerdict(Cause cause) noexcept;

/// Of two exit statuses the one that counts for both: in the order 77, 73, 65, 66, 68, 0. Any other status
/// counts more than 0 and less than 68.
int worseStatus(int first, int second) noexcept;

}  // namespace pinwell::retrieval
