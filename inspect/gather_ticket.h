// A ticket, read tolerantly and judged: container, certificates, chain, signature, payload.
#pragma once

#include "foundation/bytes.h"
#include "inspect/report.h"
#include "trust/trust.h"

namespace pinwell::inspect {

/// Searches the entries for `artefactHash`, if given. Does not decide whether the ticket is
/// acceptable.
Ticket gatherTicket(foundation::ByteView bytes, std::optional<std::uint64_t> fileOffset,
                    const std::optional<Hash>& artefactHash, trust::TrustService& service);

/// Whether the bytes look like a ticket, possibly a damaged one.
bool looksLikeTicket(foundation::ByteView bytes);

/// The first rule that fails, in the tool's order; `nullopt` for a ticket that the tool accepts as genuine.
/// Ignores the revoked flag and the entries.
std::optional<Fault> firstFaultOf(const Ticket& ticket);

}  // namespace pinwell::inspect
