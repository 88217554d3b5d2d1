// Whether a ticket is good for a file: the one rule for stapling, validating and fetching.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <vector>

#include "foundation/bytes.h"
#include "trust/trust.h"

namespace pinwell {

enum class TicketVerdict : std::uint8_t {
    acceptable,  // genuine, not revoked, and it lists the hash
    revoked,     // genuine, and marks the software as revoked, with any list of hashes
    refused,     // anything else
};

/// Judges the bytes of a ticket. `hash` is called only for a ticket that is genuine and not revoked; without
/// a hash the ticket is refused. Prints nothing. From any thread.
TicketVerdict judgeTicket(const std::optional<foundation::Data>& ticket,
                          const std::function<std::optional<foundation::Data>()>& hash,
                          trust::TrustService& trust);

/// The same of a ticket that is to list each of these hashes. Without hashes it is refused.
TicketVerdict judgeTicket(const std::optional<foundation::Data>& ticket,
                          const std::vector<foundation::Data>& hashes, trust::TrustService& trust);

}  // namespace pinwell
