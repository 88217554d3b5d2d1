#include "src/ticket_verdict.h"

#include <limits>

#include "src/tm_ticket.h"

namespace pinwell {

TicketVerdict judgeTicket(const std::optional<foundation::Data>& ticket,
                          const std::function<std::optional<foundation::Data>()>& hash,
                          trust::TrustService& trust) {
    if (!ticket || ticket->empty()) return TicketVerdict::refused;
    if (ticket->size() > std::numeric_limits<std::uint32_t>::max()) return TicketVerdict::refused;

    tm_ticket* decoded = nullptr;
    if (satchel_get_validated_tm_ticket(ticket->data(), ticket->size(), &decoded, trust) != 0)
        return TicketVerdict::refused;
    const tm_ticket_ptr owner(decoded);
    if (owner == nullptr) return TicketVerdict::refused;

    if ((tm_ticket_get_flags(owner.get()) & kTicketRevoked) != 0) return TicketVerdict::revoked;
    const auto wanted = hash();
    if (!wanted || !tm_ticket_lists_cdhash(owner.get(), *wanted)) return TicketVerdict::refused;
    return TicketVerdict::acceptable;
}

}  // namespace pinwell
