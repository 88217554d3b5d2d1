// What identifies a record: the name, made from the hash that its ticket lists, and the set that it is in.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "formats/code_hashes.h"

namespace pinwell::lumora {

using pinwell::CodeHash;

/// The length of a hash of that digest type: 20 for 0 to 3, 48 for 4; otherwise `nullopt`.
std::optional<std::size_t> hashLength(std::uint32_t algorithm);

/// "2/ALGORITHM/HEX", or "1/HEX" when the algorithm is 0.
std::string recordName(const CodeHash& hash);

/// The hash in such a name; `nullopt` for any other text, also for upper-case digits and wrong
/// lengths.
std::optional<CodeHash> parseRecordName(std::string_view name);

/// The two sets of records that a service keeps apart.
enum class Environment { production, development };

std::string_view toString(Environment environment);

/// `nullopt` for any other text.
std::optional<Environment> parseEnvironment(std::string_view text);

}  // namespace pinwell::lumora
