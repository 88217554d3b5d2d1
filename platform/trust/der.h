// Reads DER tags and lengths (ITU-T X.690) without a schema.
//
//   element = tag, length, contents
//   tag     first byte: class (2 bits), constructed (1 bit), number (5 bits); 31 means that the number
//           follows in base 128, most significant digit first, bit 8 set in all digits but the last
//   length  below 128: one byte; else a byte 0x80 + n, then n bytes, big-endian
//
// Refused: truncated elements, numbers and lengths not in their shortest form, indefinite lengths.
#pragma once

#include <cstdint>
#include <optional>
#include <utility>

#include "foundation/bytes.h"

namespace pinwell::trust::der {

enum class TagClass : std::uint8_t { universal = 0, application = 1, contextSpecific = 2, privateUse = 3 };

struct Tag {
    TagClass tagClass = TagClass::universal;
    bool constructed = false;
    std::uint32_t number = 0;

    bool operator==(const Tag&) const = default;
};

inline constexpr Tag kConstructedSequence{TagClass::universal, true, 16};
inline constexpr Tag kInteger{TagClass::universal, false, 2};

/// Maximum nesting of the elements of a certificate. Real certificates stay below 12.
inline constexpr unsigned kMaximumNesting = 32;

/// One element at the start of a byte range.
struct Element {
    Tag tag;
    foundation::ByteView whole;  // tag, length and contents
    foundation::ByteView contents;
};

/// The tag at the start of `bytes` and its size in bytes; `nullopt` if it is truncated, or its number is not
/// minimal or does not fit 32 bits.
std::optional<std::pair<Tag, std::size_t>> readTag(foundation::ByteView bytes);

/// Tag and definite length at the start of `bytes`; `nullopt` if either is unreadable, the length is
/// indefinite or not minimally encoded, or the contents reach past the end. Never reads past the end.
std::optional<Element> readElement(foundation::ByteView bytes);

/// Whether the bytes are elements end to end, also inside every constructed element, with at most
/// `depth` levels. So a certificate that passes has no indefinite length, which OpenSSL would
/// accept.
bool isNestedDefinite(foundation::ByteView bytes, unsigned depth = kMaximumNesting);

}  // namespace pinwell::trust::der
