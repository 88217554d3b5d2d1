// The first rule of a format that some bytes break, and where: what a refusal is explained with.
#pragma once

#include <cstdint>

namespace pinwell {

struct ticket_fault {
    /// From the start of the bytes that were looked at.
    std::uint64_t offset = 0;

    /// What is wrong, one line without a full stop. Of static storage, so that refusing allocates nothing.
    const char* rule = "";

    bool operator==(const ticket_fault&) const = default;
};

}  // namespace pinwell
