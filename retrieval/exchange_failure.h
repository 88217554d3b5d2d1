// Failed exchanges: errors, and responses that say nothing about the request.
#pragma once

#include <chrono>
#include <optional>

#include "retrieval/answer.h"
#include "retrieval/connection.h"

namespace pinwell::retrieval {

/// Returns `nullopt` if there is a response with a body, and its status is not one of a gateway or an
/// overloaded service (429, 502, 503, 504). Otherwise returns the failure as an answer, which is not
/// `answered`.
std::optional<Answer> failureOf(const Exchange& exchange);

/// Whether a response of this status asks for a later retry.
bool isBusyStatus(int status);

/// The delay that the response asks for (RFC 9110, section 10.2.3); `nullopt` if it names none.
std::optional<std::chrono::seconds> retryAfterOf(const https::HTTPResponse& response);

}  // namespace pinwell::retrieval
