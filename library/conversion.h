// Converts the parsers' results to the interface's types. For this folder only.
#pragma once

#include <string>
#include <utility>

#include "foundation/bytes.h"
#include "foundation/error.h"
#include "pinwell/ticket.h"
#include "src/ticket_fault.h"

namespace pinwell::ticket {
inline namespace v0 {

inline Error malformed(const ticket_fault& fault, std::uint64_t base = 0) {
    return {ErrorCode::malformed, base + fault.offset, 0, fault.rule};
}

inline Error unreadable(const foundation::Error& error) {
    const bool isErrno = error.domain() == foundation::kPOSIXErrorDomain;
    return {ErrorCode::unreadable, 0, isErrno ? static_cast<int>(error.code()) : 0,
            error.localizedFailureReason()};
}

/// The offset of `part` in `whole`, which contains it.
inline std::uint64_t offsetIn(ByteView whole, const std::byte* part) {
    return static_cast<std::uint64_t>(part - whole.data());
}

}  // namespace v0
}  // namespace pinwell::ticket
