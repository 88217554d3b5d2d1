#include "gate/ticket.h"

#include "foundation/format.h"
#include "inspect/gather_ticket.h"
#include "src/satchel.h"
#include "src/tm_ticket.h"
#include "verify/check_names.h"

namespace pinwell::gate {

using foundation::format;

JudgedTicket::JudgedTicket(ByteView bytes, trust::TrustService& trust) {
    tm_ticket* decoded = nullptr;
    if (satchel_get_validated_tm_ticket(bytes.data(), bytes.size(), &decoded, trust) != 0) {
        const auto fault =
            inspect::firstFaultOf(inspect::gatherTicket(bytes, std::nullopt, std::nullopt, trust));
        fault_ = fault ? fault->rule : "it is refused";
        return;
    }
    const tm_ticket_ptr ticket(decoded);
    isGenuine_ = true;
    isRevoked_ = (tm_ticket_get_flags(ticket.get()) & kTicketRevoked) != 0;
    signatureTime_ = tm_ticket_get_signature_time(ticket.get());
    const std::uint32_t count = tm_ticket_get_cdhash_count(ticket.get());
    for (std::uint32_t i = 0; i < count; ++i) {
        tm_cdhash entry;
        if (tm_ticket_copy_cdhash(ticket.get(), i, &entry) != 0) continue;
        entries_.insert(
            foundation::toString(ByteView(entry.hash).first(tm_cdhash_algorithm_get_size(entry.algorithm))));
    }
}

bool JudgedTicket::lists(ByteView codeHash) const {
    return entries_.contains(foundation::toString(codeHash));
}

bool checkTicket(const JudgedTicket& ticket, const std::optional<Data>& codeHash, const std::string& place,
                 verify::Section& section) {
    if (!ticket.isGenuine()) {
        section.fail(verify::kTicketGenuine, place, "a ticket of a trusted signer", ticket.fault());
        return false;
    }
    section.pass(verify::kTicketGenuine, place, "a ticket of a trusted signer");
    if (ticket.isRevoked()) {
        section.fail(verify::kTicketRevoked, place, "a ticket that does not revoke",
                     "it revokes the software");
        return false;
    }
    section.pass(verify::kTicketRevoked, place, "a ticket that does not revoke");
    if (!codeHash) {
        section.fail(verify::kTicketLists, place, "the artefact's hash",
                     "the artefact has no hash that a ticket could list");
        return false;
    }
    const std::string hash = foundation::toHex(*codeHash);
    if (!ticket.lists(*codeHash)) {
        section.fail(verify::kTicketLists, place, hash, format("%zu other hashes", ticket.entryCount()));
        return false;
    }
    section.pass(verify::kTicketLists, place, hash);
    return true;
}

}  // namespace pinwell::gate
