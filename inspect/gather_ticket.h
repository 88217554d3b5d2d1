// A ticket, read tolerantly and judged: container, certificates, chain, signature, payload.
#pragma once

#include "foundation/bytes.h"
#include "inspect/report.h"
#include "trust/trust.h"

namespace pinwell::inspect {

/// `artefactHash`, when there is one, is looked for among the entries. Whether the ticket is acceptable is
/// not said here.
Ticket gatherTicket(foundation::ByteView bytes, std::optional<std::uint64_t> fileOffset,
                    const std::optional<Hash>& artefactHash, trust::TrustService& service);

/// Whether the bytes are meant to be a ticket, as far as that shows in damaged ones too.
bool looksLikeTicket(foundation::ByteView bytes);

/// The first rule that fails, in the order in which the tool asks; nothing for a ticket that it accepts as
/// genuine. Neither the revoked flag nor the entries count here.
std::optional<Fault> firstFaultOf(const Ticket& ticket);

}  // namespace pinwell::inspect
