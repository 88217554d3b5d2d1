#include "retrieval/refused_ticket.h"

#include "src/explain_ticket.h"

namespace pinwell::retrieval {

std::string ruleBrokenByTicket(const std::optional<foundation::Data>& ticket,
                               const std::vector<foundation::Data>& hashes, trust::TrustService& trust) {
    if (!ticket) return "its text is not base64";
    const auto refusal = explain_ticket(*ticket, hashes.front(), trust);
    return refusal ? refusal->reason : "the ticket does not list every hash of the artefact";
}

}  // namespace pinwell::retrieval
