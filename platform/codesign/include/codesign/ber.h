// Reads BER (ITU-T X.690) without a schema: the encoding of CMS messages.
//
//   element = tag, length, contents
//   tag     first byte: class (2 bits), constructed (1 bit), number (5 bits); 31 means that the number
//           follows in base 128, bit 8 set in all digits but the last
//   length  below 128: one byte; 0x80 + n: n bytes, big-endian, with or without leading zeros; 0x80 alone:
//           indefinite, the contents end with the two bytes 00 00. Only constructed elements may have that.
//
// DER is BER with definite lengths in their shortest form, so a BER reader also reads DER.
//
// The contents of an element are read only on request. Reading an element costs its header, or, with an
// indefinite length, a pass over the headers inside it. Headers are counted, so that nested indefinite
// lengths, each of which costs such a pass, reach a limit.
#pragma once

#include <algorithm>
#include <cstdint>
#include <optional>

#include "base/bytes.h"

namespace pinwell::codesign::ber {

using base::ByteView;
using base::Data;

inline bool isEqual(ByteView a, ByteView b) {
    return std::ranges::equal(a, b);
}

/// First bytes of elements: class, constructed bit and a number below 31.
inline constexpr std::uint8_t kInteger = 0x02;
inline constexpr std::uint8_t kBitString = 0x03;
inline constexpr std::uint8_t kOctetString = 0x04;
inline constexpr std::uint8_t kObjectIdentifier = 0x06;
inline constexpr std::uint8_t kGeneralizedTime = 0x18;
inline constexpr std::uint8_t kSequence = 0x30;
inline constexpr std::uint8_t kSet = 0x31;
inline constexpr std::uint8_t kConstructed = 0x20;

/// `[number]` in a schema: constructed if it is explicit, or replaces the tag of a constructed type.
constexpr std::uint8_t context(unsigned number, bool constructed = true) {
    return static_cast<std::uint8_t>(0x80U | (constructed ? kConstructed : 0U) | number);
}

/// Maximum nesting of elements of indefinite length, and maximum depth of rewriting as DER. A message with a
/// time-stamp token stays below 30.
inline constexpr unsigned kMaximumNesting = 64;

/// Maximum nesting of the pieces of one string. In practice they are all on one level.
inline constexpr std::size_t kMaximumStringNesting = 5;

/// Maximum number of headers read in one message, with repeated passes. A signer's message has some 500.
inline constexpr std::uint32_t kMaximumHeaders = 1'000'000;

/// The headers read so far of one message, by all of its readers together.
struct Work {
    std::uint32_t headers = 0;
};

struct Element {
    std::uint8_t tag = 0;  // the first byte; for a number above 30, a byte that equals no tag of a schema
    ByteView wholeTag;     // all of its bytes
    ByteView whole;        // tag, length, contents, and the end of an indefinite length
    ByteView contents;

    bool isConstructed() const noexcept { return (tag & kConstructed) != 0; }
};

/// A forward cursor over elements end to end. It owns nothing. Throws CodeError (kInvalidSignature) for
/// malformed bytes, and if the requested element is missing; `what` names it, such as "the signer's
/// version".
class Reader {
  public:
    /// `work` must outlive the reader.
    Reader(ByteView elements, Work& work) noexcept : rest_(elements), work_(&work) {}

    bool atEnd() const noexcept { return rest_.empty(); }

    /// The next element, of any tag.
    Element next(const char* what);

    /// The next element, which must have this tag.
    Element expect(std::uint8_t tag, const char* what);

    /// The next element if it has this tag; otherwise nullopt, and the reader has not moved.
    std::optional<Element> nextIf(std::uint8_t tag, const char* what);

    /// Throws unless all elements have been read.
    void finish(const char* what) const;

  private:
    ByteView rest_;
    Work* work_;
};

/// The octets of an OCTET STRING, or of an element whose tag replaces it: its contents, or the contents of
/// all strings in a constructed one. Throws CodeError.
Data octets(const Element& element, Work& work, const char* what);

/// The element with DER's lengths: all definite, all in their shortest form, OCTET STRINGs in one piece. The
/// order in a SET does not change. Throws CodeError.
Data inDer(const Element& element, Work& work, const char* what);

/// A definite element: tag, shortest length, contents.
Data makeElement(std::uint8_t tag, ByteView contents);

}  // namespace pinwell::codesign::ber
