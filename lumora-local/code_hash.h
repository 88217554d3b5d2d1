// The hash that a ticket vouches for, and the name of the record that holds the ticket.
#pragma once

#include <compare>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "foundation/bytes.h"

namespace pinwell::lumora {

/// A code directory's hash with the number of its digest type. Number 0 stands for a hash whose digest type
/// is not known; it has 20 bytes.
struct CodeHash {
    std::uint32_t algorithm = 0;
    foundation::Data hash;

    auto operator<=>(const CodeHash&) const = default;
};

/// The length of a hash of that digest type: 20 for 0 to 3, 48 for 4; nothing for any other.
std::optional<std::size_t> hashLength(std::uint32_t algorithm);

/// "2/ALGORITHM/HEX", or "1/HEX" when the algorithm is 0.
std::string recordName(const CodeHash& hash);

/// The hash that such a name is made of; nothing for any other text (upper-case digits and wrong lengths
/// included).
std::optional<CodeHash> parseRecordName(std::string_view name);

}  // namespace pinwell::lumora
