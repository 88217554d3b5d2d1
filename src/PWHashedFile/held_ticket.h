// How much of a stapled ticket is held in memory.
//
// A stale ticket may have any length and content, and can be replaced. A ticket longer than the sum
// of its parts' maxima is never accepted. So only its beginning is held, which is refused like the
// whole.
#pragma once

#include <algorithm>
#include <cstdint>
#include <optional>

#include "src/satchel.h"
#include "src/ticket_fault.h"
#include "src/tm_ticket.h"

namespace pinwell {

inline constexpr std::uint64_t kLongestTicketHeld = 64ULL * 1024 * 1024;

static_assert(kSatchelMaximumCertificates * kSatchelMaximumCertificateSize + kTicketMaximumSize <
                  kLongestTicketHeld / 2,
              "what is cut off belongs to no ticket that is accepted");

/// How many bytes of a ticket of that length are held.
inline std::uint64_t heldOfTicket(std::uint64_t length) {
    return std::min(length, kLongestTicketHeld);
}

/// The fault of a ticket of that length that begins at `offset` in its file; `nullopt` if it is held whole.
inline std::optional<ticket_fault> faultOfTicketLength(std::uint64_t length, std::uint64_t offset) {
    if (heldOfTicket(length) == length) return std::nullopt;
    return ticket_fault{offset, "the ticket is too long to be read"};
}

}  // namespace pinwell
