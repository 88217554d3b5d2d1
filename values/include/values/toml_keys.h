// A check of TOML documents before they are parsed.
#pragma once

#include <optional>
#include <string_view>

namespace pinwell::values {

/// The line of the first key or table name with more than `parts` parts ("a.b.c" has three), outside of
/// strings and comments; `nullopt` if there is none. toml++ has no such limit: it makes a table for each
/// part, and frees nested tables by recursion. (It limits arrays and inline tables to 256.) Stops at an
/// unterminated string, because the parser stops there too.
std::optional<unsigned> lineOfLongTomlKey(std::string_view document, unsigned parts);

}  // namespace pinwell::values
