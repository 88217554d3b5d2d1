// A ticket, read tolerantly and judged: container, certificates, chain, signature, payload.
#pragma once

#include "base/bytes.h"
#include "report.h"
#include "trust/trust.h"

namespace pinwell::inspect {

/// The artefact that a ticket is attached to.
struct Holder {
    std::optional<Hash> hash;  // `nullopt` without a valid signature
};

/// Shows the ticket, with the reason if explainTicket refuses it. `holder` is `nullopt` for a ticket by
/// itself, which is then judged without an artefact.
Ticket gatherTicket(base::ByteView bytes, std::optional<std::uint64_t> fileOffset,
                    const std::optional<Holder>& holder, trust::TrustService& service);

/// Whether the bytes look like a ticket, possibly a damaged one.
bool looksLikeTicket(base::ByteView bytes);

}  // namespace pinwell::inspect
