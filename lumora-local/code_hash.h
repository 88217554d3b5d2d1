// The hash that a ticket lists, and the name of the record with the ticket.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "src/code_hashes.h"

namespace pinwell::lumora {

using pinwell::CodeHash;

/// The length of a hash of that digest type: 20 for 0 to 3, 48 for 4; otherwise `nullopt`.
std::optional<std::size_t> hashLength(std::uint32_t algorithm);

/// "2/ALGORITHM/HEX", or "1/HEX" when the algorithm is 0.
std::string recordName(const CodeHash& hash);

/// The hash in such a name; `nullopt` for any other text, also for upper-case digits and wrong
/// lengths.
std::optional<CodeHash> parseRecordName(std::string_view name);

}  // namespace pinwell::lumora
