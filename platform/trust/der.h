// Reading DER tags and lengths (X.690) without a schema.
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

/// One element at the front of a byte range.
struct Element {
    Tag tag;
    foundation::ByteView whole;     // tag, length and contents
    foundation::ByteView contents;
};

/// The tag at the front of `bytes` and its size in bytes; nothing when it is cut short, or its number is not minimal
/// or does not fit 32 bits.
std::optional<std::pair<Tag, std::size_t>> readTag(foundation::ByteView bytes);

/// Tag and definite length at the front of `bytes`; nothing when either cannot be read, the length is indefinite or
/// not minimally encoded, or the contents reach past the end. Never reads past the end.
std::optional<Element> readElement(foundation::ByteView bytes);

}  // namespace pinwell::trust::der
