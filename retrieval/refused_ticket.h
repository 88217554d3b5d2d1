// Why a ticket from elsewhere was refused, for messages of the companions.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "foundation/bytes.h"
#include "trust/trust.h"

namespace pinwell::retrieval {

/// The rule that a refused ticket breaks, without a full stop. `ticket` is `nullopt` if its text is not
/// base64. `hashes` are the ones that it had to list, the artefact's own first; never empty.
std::string ruleBrokenByTicket(const std::optional<foundation::Data>& ticket,
                               const std::vector<foundation::Data>& hashes, trust::TrustService& trust);

}  // namespace pinwell::retrieval
