// A check of TOML documents that comes before their parser.
#pragma once

#include <optional>
#include <string_view>

namespace pinwell::foundation {

/// The line of the first key, or table's name, of more than `parts` parts ("a.b.c" has three), outside of
/// strings and comments; `nullopt` if there is none. toml++ has no limit of its own: it makes a table for
/// each part, and frees tables inside one another by recursion. (Of arrays and inline tables it takes 256.)
/// What follows an unfinished string is left alone: the parser does not get there.
std::optional<unsigned> lineOfLongTomlKey(std::string_view document, unsigned parts);

}  // namespace pinwell::foundation
