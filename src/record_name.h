// The name of a ticket's record.
#pragma once

#include <cstdint>
#include <string>

#include "foundation/bytes.h"

namespace pinwell {

/// The name of the record that holds the ticket for a code hash: "2/ALGORITHM/HEX", or "1/HEX" if the
/// algorithm is 0.
std::string recordNameForHash(std::uint32_t algorithm, foundation::ByteView hash);

}  // namespace pinwell
