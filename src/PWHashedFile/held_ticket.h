// How much of a stapled ticket is held in memory.
//
// A stale ticket may have any length and content, and can be replaced. A ticket longer than the sum
// of its parts' maxima is never accepted. So only its beginning is held, which is refused like the
// whole.
#pragma once

#include <algorithm>
#include <cstdint>

#include "src/satchel.h"
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

}  // namespace pinwell
