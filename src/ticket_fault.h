// What the functions of the ticket formats return, and the rule that explains a refusal.
#pragma once

#include <cstdint>

namespace pinwell {

/// Results of the ticket functions that return a number.
inline constexpr std::int32_t kAccepted = 0;
inline constexpr std::int32_t kRefused = -1;

struct ticket_fault {
    /// From the start of the bytes that were looked at.
    std::uint64_t offset = 0;

    /// What is wrong, one line without a full stop. Of static storage, so that refusing allocates nothing.
    const char* rule = "";

    bool operator==(const ticket_fault&) const = default;
};

}  // namespace pinwell
