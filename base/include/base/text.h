// Text: its encodings, all strict, and the forms in which people see it on a screen, in XML and in HTML.
//
// UTF-8 is as in RFC 3629: no overlong forms, no surrogates, nothing above U+10FFFF. Base64 is as in RFC
// 4648, section 4: the standard alphabet, padded, nothing else.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/bytes.h"

namespace pinwell::base {

/// Two lower-case hexadecimal digits for each byte, no separators.
std::string toHex(ByteView bytes);

/// The bytes that lower-case hexadecimal digits give, two a byte. `nullopt` for all other text.
std::optional<Data> parseHex(std::string_view text);

/// Returns `nullopt` if `text` has a character outside the alphabet (even a line break), is not padded to a
/// multiple of four, or has set bits that the padding cuts off. Empty text gives an empty buffer.
std::optional<Data> decodeBase64(std::string_view text);

std::string encodeBase64(ByteView bytes);

/// Length in bytes of the well-formed sequence at the start of `text`; 0 if there is none.
std::size_t utf8SequenceLength(std::string_view text) noexcept;

bool isUTF8(std::string_view text) noexcept;

/// Whether one well-formed sequence is a control character: C0, DEL or C1.
bool isControlCharacter(std::string_view sequence) noexcept;

/// White space of ASCII. Unlike the C library's function, independent of the locale.
constexpr bool isSpace(char c) {
    return c == ' ' || (c >= '\t' && c <= '\r');
}

/// The text with control characters (C0, DEL, C1) and malformed UTF-8 replaced by backslash escapes, and with
/// a backslash before each character of `alsoEscaped`.
std::string escapeForTerminal(std::string_view text, std::string_view alsoEscaped = {});

/// As escapeForTerminal(), and characters that change the direction of writing as "\u202e": such a character
/// can make one name look like another.
std::string escapeForDisplay(std::string_view text);

/// In UTF-8, without control characters and without characters that change the direction of writing. Markup
/// characters become entities. For use between tags and in quoted attributes.
std::string markupText(std::string_view text);

/// The memory count style, 1024 bytes to the kilobyte: "Zero KB", "1 byte", "512 bytes", "1 KB", "1.5 MB",
/// "64 MB", "2.25 GB". No fraction for KB, at most one digit for MB, two from GB on; trailing zeros are
/// dropped.
std::string formatByteCount(std::uint64_t bytes);

}  // namespace pinwell::base
