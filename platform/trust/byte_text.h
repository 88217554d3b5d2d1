// Bytes as a text, for searching and for keys of a table; and the white space of a text.
#pragma once

#include <string_view>

#include "foundation/bytes.h"

namespace pinwell::trust {

/// Not copied; no encoding is assumed.
inline std::string_view asText(foundation::ByteView bytes) {
    return {static_cast<const char*>(static_cast<const void*>(bytes.data())), bytes.size()};
}

/// Unlike the C library's function, independent of the locale.
constexpr bool isSpace(char c) {
    return c == ' ' || (c >= '\t' && c <= '\r');
}

}  // namespace pinwell::trust
