// The query of a request's target: "name=2%2F2%2Fab&limit=10".
#pragma once

#include <map>
#include <optional>
#include <string>
#include <string_view>

namespace pinwell::lumora {

/// Names and values, decoded: "%" and two hexadecimal digits is a byte, "+" is a space (as forms are sent).
using Query = std::map<std::string, std::string, std::less<>>;

/// The text after the first "?" of the target, up to a "#". `nullopt` if it is malformed: a name that is
/// empty or occurs twice, a "%" without its digits, a byte 0, text that is not UTF-8.
std::optional<Query> parseQuery(std::string_view target);

/// Text in the form of a value, or of a segment of a path: every byte except letters, digits and "-._~" is
/// encoded.
std::string percentEncoded(std::string_view text);

/// `nullopt` for a "%" without its digits.
std::optional<std::string> percentDecoded(std::string_view text);

}  // namespace pinwell::lumora
