// Exchanges that brought no answer: errors, and responses that say nothing of what was asked.
#pragma once

#include <chrono>
#include <optional>

#include "retrieval/answer.h"
#include "retrieval/connection.h"

namespace pinwell::retrieval {

/// `nullopt` if there is a response with a body, unless it is that of a gateway or of a service that has too
/// much to do (429, 502, 503, 504). Otherwise an answer that says so; it is not `answered`.
std::optional<Answer> failureOf(const Exchange& exchange);

/// Whether a response of this status asks to come back later.
bool isBusyStatus(int status);

/// How long the response asks not to be asked (RFC 9110, section 10.2.3); `nullopt` if it does not say.
std::optional<std::chrono::seconds> retryAfterOf(const https::HTTPResponse& response);

}  // namespace pinwell::retrieval
