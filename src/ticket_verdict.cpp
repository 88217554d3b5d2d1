#include "src/ticket_verdict.h"

#include <algorithm>
#include <limits>

#include "src/tm_ticket.h"

namespace pinwell {

namespace {

// `isListed` is asked only about a ticket that is genuine and not revoked.
TicketVerdict judge(const std::optional<foundation::Data>& ticket, trust::TrustService& trust,
                    const std::function<bool(const tm_ticket* ticket)>& isListed) {
    if (!ticket || ticket->empty()) return TicketVerdict::refused;
    if (ticket->size() > std::numeric_limits<std::uint32_t>::max()) return TicketVerdict::refused;

    tm_ticket* decoded = nullptr;
    if (satchel_get_validated_tm_ticket(ticket->data(), ticket->size(), &decoded, trust) != 0)
        return TicketVerdict::refused;
    const tm_ticket_ptr owner(decoded);
    if (owner == nullptr) return TicketVerdict::refused;

    if ((tm_ticket_get_flags(owner.get()) & kTicketRevoked) != 0) return TicketVerdict::revoked;
    return isListed(owner.get()) ? TicketVerdict::acceptable : TicketVerdict::refused;
}

// Sorted, so that many hashes are found in a long list without comparing each with each.
std::vector<foundation::Data> hashesIn(const tm_ticket* ticket) {
    std::vector<foundation::Data> hashes;
    const std::uint32_t count = tm_ticket_get_cdhash_count(ticket);
    for (std::uint32_t i = 0; i < count; ++i) {
        tm_cdhash entry;
        if (tm_ticket_copy_cdhash(ticket, i, &entry) == 0)
            hashes.emplace_back(entry.hash.begin(), entry.hash.begin() + entry.length);
    }
    std::sort(hashes.begin(), hashes.end());
    return hashes;
}

}  // namespace

TicketVerdict judgeTicket(const std::optional<foundation::Data>& ticket,
                          const std::function<std::optional<foundation::Data>()>& hash,
                          trust::TrustService& trust) {
    return judge(ticket, trust, [&](const tm_ticket* decoded) {
        const auto wanted = hash();
        return wanted && tm_ticket_lists_cdhash(decoded, *wanted);
    });
}

TicketVerdict judgeTicket(const std::optional<foundation::Data>& ticket,
                          const std::vector<foundation::Data>& hashes, trust::TrustService& trust) {
    return judge(ticket, trust, [&](const tm_ticket* decoded) {
        const std::vector<foundation::Data> listed = hashesIn(decoded);
        return !hashes.empty() &&
               std::all_of(hashes.begin(), hashes.end(), [&](const foundation::Data& wanted) {
                   return std::binary_search(listed.begin(), listed.end(), wanted);
               });
    });
}

}  // namespace pinwell
