// UTF-8 (RFC 3629), as strict as the RFC: no overlong forms, no surrogates, nothing above U+10FFFF.
#pragma once

#include <cstddef>
#include <string_view>

namespace pinwell::foundation {

/// Length in bytes of the well-formed sequence at the start of `text`; 0 if there is none.
std::size_t utf8SequenceLength(std::string_view text) noexcept;

bool isUTF8(std::string_view text) noexcept;

/// Whether one well-formed sequence is a control character: C0, DEL or C1.
bool isControlCharacter(std::string_view sequence) noexcept;

/// White space of ASCII. Unlike the C library's function, independent of the locale.
constexpr bool isSpace(char c) {
    return c == ' ' || (c >= '\t' && c <= '\r');
}

}  // namespace pinwell::foundation
