// The exception for a failed call of the C interface. For this folder only.
#pragma once

#include <cstdint>
#include <string>
#include <utility>

#include "foundation/error.h"
#include "pinwell/ticket.h"
#include "pinwell/ticket_c.h"

namespace pinwell::library {

/// Thrown inside, and caught at the boundary (c_calls.h).
struct Failure {
    pinwell_status status = PINWELL_ERROR_INTERNAL;
    std::string message;
    int systemError = 0;
    std::uint64_t offset = 0;
};

inline Failure invalid(std::string message) {
    return {PINWELL_ERROR_ARGUMENT, std::move(message)};
}

/// Converts an error of the C++ interface about a file.
inline Failure failureOf(const ticket::Error& error) {
    const bool isMalformed = error.code == ticket::ErrorCode::malformed;
    return {isMalformed ? PINWELL_ERROR_MALFORMED : PINWELL_ERROR_UNREADABLE, error.message,
            error.systemError, error.offset};
}

/// Converts an error of the services about a file.
inline Failure failureOf(const foundation::Error& error) {
    const std::string& reason = error.localizedFailureReason();
    return {PINWELL_ERROR_UNREADABLE, reason.empty() ? error.localizedDescription() : reason,
            error.domain() == foundation::kPOSIXErrorDomain ? static_cast<int>(error.code()) : 0};
}

}  // namespace pinwell::library
