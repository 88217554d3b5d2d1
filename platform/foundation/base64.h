// Base64 (RFC 4648, section 4), strict: the standard alphabet, padded, nothing else.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "foundation/bytes.h"

namespace pinwell::foundation {

/// Returns `nullopt` if `text` has a character outside the alphabet (even a line break), is not padded to a
/// multiple of four, or has set bits that the padding cuts off. Empty text gives an empty buffer.
std::optional<Data> decodeBase64(std::string_view text);

std::string encodeBase64(ByteView bytes);

}  // namespace pinwell::foundation
