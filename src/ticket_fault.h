// The results of the ticket formats' functions, and the rule that explains a refusal.
#pragma once

#include <cstdint>

namespace pinwell {

/// Results of the ticket functions that return a number.
inline constexpr std::int32_t kAccepted = 0;
inline constexpr std::int32_t kRefused = -1;

struct ticket_fault {
    /// From the start of the examined bytes.
    std::uint64_t offset = 0;

    /// The broken rule, in one line without a full stop. In static storage, so that a refusal does not
    /// allocate.
    const char* rule = "";

    bool operator==(const ticket_fault&) const = default;
};

}  // namespace pinwell
