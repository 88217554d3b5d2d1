// The syntax of HTTP header fields.
#pragma once

#include <algorithm>
#include <string_view>

namespace pinwell::https {

/// A method or a field's name (RFC 9110, section 5.6.2).
inline bool isToken(std::string_view text) noexcept {
    const auto tokenCharacter = [](char c) {
        return (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') ||
               std::string_view("!#$%&'*+-.^_`|~").find(c) != std::string_view::npos;
    };
    return !text.empty() && std::all_of(text.begin(), text.end(), tokenCharacter);
}

/// A field's value as we send it: no control character except the tab.
inline bool isFieldValue(std::string_view text) noexcept {
    return std::none_of(text.begin(), text.end(), [](char c) {
        const auto byte = static_cast<unsigned char>(c);
        return (byte < 0x20 && c != '\t') || byte == 0x7F;
    });
}

inline bool isDigit(char c) noexcept {
    return c >= '0' && c <= '9';
}

}  // namespace pinwell::https
