#include "trust/der.h"

#include <limits>

#include "foundation/byte_reader.h"

namespace pinwell::trust::der {
namespace {

using foundation::ByteReader;
using foundation::ByteView;
using foundation::ShortRead;

constexpr std::uint8_t kConstructedBit = 0x20;
constexpr std::uint8_t kLongTagNumber = 0x1F;  // also the mask of the short form
constexpr std::uint32_t kMoreBit = 0x80;       // of the tag number's base-128 digits
constexpr std::uint8_t kLongLengthBit = 0x80;

/// The base-128 digits of a tag number that does not fit the first byte (X.690, 8.1.2.4).
std::optional<std::uint32_t> readLongTagNumber(ByteReader& reader) {
    std::uint8_t digit = reader.u8("tag number");
    if (digit == kMoreBit) return std::nullopt;  // a leading zero digit
    std::uint32_t number = digit & ~kMoreBit;
    while ((digit & kMoreBit) != 0) {
        if (number > (std::numeric_limits<std::uint32_t>::max() >> 7U)) return std::nullopt;
        digit = reader.u8("tag number");
        number = (number << 7U) | (digit & ~kMoreBit);
    }
    if (number < kLongTagNumber) return std::nullopt;
    return number;
}

std::optional<Tag> readTag(ByteReader& reader) {
    const std::uint8_t first = reader.u8("tag");
    Tag tag{static_cast<TagClass>(first >> 6U), (first & kConstructedBit) != 0,
            static_cast<std::uint32_t>(first & kLongTagNumber)};
    if (tag.number == kLongTagNumber) {
        const std::optional<std::uint32_t> number = readLongTagNumber(reader);
        if (!number) return std::nullopt;
        tag.number = *number;
    }
    return tag;
}

/// A definite length in its shortest form (X.690, 8.1.3 and 10.1).
std::optional<std::uint64_t> readLength(ByteReader& reader) {
    const std::uint8_t first = reader.u8("length");
    if ((first & kLongLengthBit) == 0) return first;
    const unsigned count = first & ~static_cast<unsigned>(kLongLengthBit);
    if (count == 0 || count > sizeof(std::uint64_t))
        return std::nullopt;  // indefinite; longer than any input
    std::uint64_t length = reader.u8("length");
    if (length == 0) return std::nullopt;
    for (unsigned i = 1; i < count; ++i) length = (length << 8U) | reader.u8("length");
    if (length < kLongLengthBit) return std::nullopt;
    return length;
}

}  // namespace

std::optional<std::pair<Tag, std::size_t>> readTag(ByteView bytes) {
    try {
        ByteReader reader(bytes);
        const std::optional<Tag> tag = readTag(reader);
        if (!tag) return std::nullopt;
        return std::pair{*tag, reader.position()};
    } catch (const ShortRead&) {
        return std::nullopt;
    }
}

std::optional<Element> readElement(ByteView bytes) {
    try {
        ByteReader reader(bytes);
        const std::optional<Tag> tag = readTag(reader);
        if (!tag) return std::nullopt;
        const std::optional<std::uint64_t> length = readLength(reader);
        if (!length) return std::nullopt;
        const ByteView contents = reader.bytes(*length, "contents");
        return Element{*tag, bytes.first(reader.position()), contents};
    } catch (const ShortRead&) {
        return std::nullopt;
    }
}

bool isNestedDefinite(ByteView bytes, unsigned depth) {
    while (!bytes.empty()) {
        const std::optional<Element> element = readElement(bytes);
        if (!element) return false;
        if (element->tag.constructed && (depth == 0 || !isNestedDefinite(element->contents, depth - 1)))
            return false;
        bytes = bytes.subspan(element->whole.size());
    }
    return true;
}

}  // namespace pinwell::trust::der
