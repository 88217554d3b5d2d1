// Reads DER (ITU-T X.690): tags and lengths without a schema, and values with a known schema.
//
//   element = tag, length, contents
//   tag     first byte: class (2 bits), constructed (1 bit), number (5 bits); 31 means that the number
//           follows in base 128, most significant digit first, bit 8 set in all digits but the last
//   length  below 128: one byte; else a byte 0x80 + n, then n bytes, big-endian
//
// Refused: truncated elements, numbers and lengths not in their shortest form, indefinite lengths.
//
//   BOOLEAN            01 01 vv               vv is 00 or FF (11.1)
//   INTEGER            02 n  two's complement, in the fewest bytes (8.3.2)
//   BIT STRING         03 n  u bits           u counts the unused bits at the end, which are zero (11.2.1)
//   OBJECT IDENTIFIER  06 n  arcs             base 128, no leading zero digit (8.19.2)
//   UTCTime            17 0D YYMMDDhhmmssZ    50 to 99 belong to 1950 to 1999 (RFC 5280, 4.1.2.5.1)
//   GeneralizedTime    18 0F YYYYMMDDhhmmssZ  (RFC 5280, 4.1.2.5.2)
//
// One departure from DER: a BOOLEAN with its default value may be present, as some authorities write it. It
// changes no meaning.
#pragma once

#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>

#include "base/bytes.h"
#include "values/date.h"

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
    base::ByteView whole;  // tag, length and contents
    base::ByteView contents;
};

/// The tag at the start of `bytes` and its size in bytes; `nullopt` if it is truncated, or its number is not
/// minimal or does not fit 32 bits.
std::optional<std::pair<Tag, std::size_t>> readTag(base::ByteView bytes);

/// Tag and definite length at the start of `bytes`; `nullopt` if either is unreadable, the length is
/// indefinite or not minimally encoded, or the contents reach past the end. Never reads past the end.
std::optional<Element> readElement(base::ByteView bytes);

/// Whether the bytes are elements end to end, also inside every constructed element, with at most
/// `depth` levels. So a certificate that passes has no indefinite length, which OpenSSL would
/// accept.
bool isNestedDefinite(base::ByteView bytes, unsigned depth = kMaximumNesting);

/// Longer object identifiers are refused. RFC 5280, appendix B, requires readers to accept 100 bytes of the
/// dotted form, which is longer than the contents.
inline constexpr std::size_t kMaximumOidSize = 128;

inline constexpr Tag kBoolean{TagClass::universal, false, 1};
inline constexpr Tag kBitString{TagClass::universal, false, 3};
inline constexpr Tag kOctetString{TagClass::universal, false, 4};
inline constexpr Tag kNull{TagClass::universal, false, 5};
inline constexpr Tag kOid{TagClass::universal, false, 6};
inline constexpr Tag kConstructedSet{TagClass::universal, true, 17};
inline constexpr Tag kUtcTime{TagClass::universal, false, 23};
inline constexpr Tag kGeneralizedTime{TagClass::universal, false, 24};

constexpr Tag contextTag(std::uint32_t number, bool constructed) {
    return {TagClass::contextSpecific, constructed, number};
}

/// Thrown if the bytes do not have the expected structure. Parsers catch it at their public boundary.
class Malformed : public std::runtime_error {
  public:
    explicit Malformed(const char* what) : std::runtime_error(what) {}
};

/// The contents of an INTEGER in two's complement; throws Malformed unless they have the fewest bytes.
void checkInteger(base::ByteView contents);

/// The magnitude of an INTEGER's contents without leading zero bytes, empty for 0; throws Malformed if the
/// number is negative, or not in the fewest bytes.
base::ByteView naturalNumber(base::ByteView contents);

/// The bytes of a BIT STRING's contents; throws Malformed unless the unused bits are zero.
base::ByteView bitString(base::ByteView contents);

/// The bytes of a BIT STRING without unused bits; throws Malformed for any other.
base::ByteView wholeBytes(base::ByteView contents);

/// The dotted form of an object identifier's contents; throws Malformed.
std::string dottedOid(base::ByteView contents);

/// Throws Malformed for any form except the two at the top of this file, and for an invalid date.
values::Date readTime(const Element& element);

/// A forward cursor over elements end to end. It owns nothing. If a read throws Malformed, the cursor has not
/// moved.
class Cursor {
  public:
    explicit Cursor(base::ByteView bytes) noexcept : rest_(bytes) {}

    bool atEnd() const noexcept { return rest_.empty(); }
    base::ByteView rest() const noexcept { return rest_; }

    Element any();
    Element take(Tag tag);
    std::optional<Element> takeIf(Tag tag);

    /// A cursor over the contents of the next element.
    Cursor enter(Tag tag) { return Cursor(take(tag).contents); }

    /// Throws Malformed unless nothing is left.
    void expectEnd() const;

    bool boolean();
    std::string oid() { return dottedOid(take(kOid).contents); }
    base::ByteView naturalNumber() { return der::naturalNumber(take(kInteger).contents); }

  private:
    base::ByteView rest_;
};

}  // namespace pinwell::trust::der
