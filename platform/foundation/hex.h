// Bytes from hexadecimal digits. toHex() (bytes.h) is the way back.
#pragma once

#include <optional>
#include <string_view>

#include "foundation/bytes.h"

namespace pinwell::foundation {

/// The bytes that lower-case hexadecimal digits give, two a byte. `nullopt` for all other text.
std::optional<Data> parseHex(std::string_view text);

}  // namespace pinwell::foundation
