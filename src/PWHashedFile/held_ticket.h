// How much of a stapled ticket is held in memory.
//
// A stale ticket may have any length, and is replaced whatever it is. None is accepted that is longer than
// its parts' maxima come to; so of a longer one the beginning is held, which is refused as the whole would
// be.
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

/// What is held of a ticket of that many bytes.
inline std::uint64_t heldOfTicket(std::uint64_t length) {
    return std::min(length, kLongestTicketHeld);
}

}  // namespace pinwell
