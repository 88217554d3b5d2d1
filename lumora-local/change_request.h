// The bodies of the requests that issue and revoke (docs/service/openapi.json).
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "lumora-local/commands.h"

namespace pinwell::lumora {

inline constexpr std::size_t kMaximumListedHashes = 8192;
inline constexpr std::size_t kMaximumLabelBytes = 1024;
inline constexpr std::size_t kMaximumCommentBytes = 4096;

struct TicketRequest {
    Environment environment = Environment::production;
    DescribedArtefact artefact;
    bool reinstates = false;
    std::string comment;
};

struct RevocationRequest {
    Environment environment = Environment::production;
    std::string record;
    Reason reason = Reason::unspecified;
    std::string comment;
};

/// Both throw Refused: 400 if the text is not a JSON object, 422 if a member is missing, unknown, of another
/// type or out of its bounds.
TicketRequest parseTicketRequest(std::string_view body);
RevocationRequest parseRevocationRequest(std::string_view body);

/// The record and the set that a body names, as far as they can be read; for the log.
RefusedAttempt attemptIn(std::string_view body);

/// The key in the header Idempotency-Key, without its quotes. Throws Refused (400) if it is none.
std::string parseIdempotencyKey(std::string_view header);

}  // namespace pinwell::lumora
