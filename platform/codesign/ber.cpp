#include "codesign/ber.h"

#include <algorithm>
#include <string>
#include <vector>

#include "base/byte_io.h"
#include "codesign/code_error.h"

namespace pinwell::codesign::ber {

namespace {

using base::ByteReader;

constexpr std::uint8_t kEndOfContents = 0x00;
constexpr std::uint8_t kLongTagNumber = 0x1F;
constexpr std::uint8_t kMoreDigits = 0x80;
constexpr std::uint8_t kLongLength = 0x80;  // with zero lower bits: indefinite
constexpr std::uint8_t kReservedLength = 0xFF;
constexpr std::size_t kEndOfContentsSize = 2;

/// Tag, shortest definite length, contents.
Data withHeader(ByteView tag, ByteView contents) {
    Data result = base::toData(tag);
    std::size_t digits = 0;
    for (std::size_t rest = contents.size(); rest != 0; rest >>= 8U) ++digits;
    if (contents.size() < kLongLength) {
        result.push_back(static_cast<std::byte>(contents.size()));
    } else {
        result.push_back(static_cast<std::byte>(kLongLength + digits));
        while (digits-- > 0) result.push_back(static_cast<std::byte>(contents.size() >> (8U * digits)));
    }
    base::append(result, contents);
    return result;
}

[[noreturn]] void malformed(const char* what) {
    refuse(std::string(what) + " is malformed");
}

struct Header {
    std::uint8_t tag = 0;
    std::size_t tagSize = 0;
    std::size_t size = 0;
    std::optional<std::uint64_t> length;  // nullopt: indefinite

    bool isEndOfContents() const { return tag == kEndOfContents; }
};

/// The tag; the digits of a number above 30 are skipped.
std::uint8_t readTag(ByteReader& reader) {
    const std::uint8_t tag = reader.u8("tag");
    if ((tag & kLongTagNumber) == kLongTagNumber)
        while ((reader.u8("tag number") & kMoreDigits) != 0) {
        }
    return tag;
}

std::optional<std::uint64_t> readLength(ByteReader& reader, const char* what) {
    const std::uint8_t first = reader.u8("length");
    if (first < kLongLength) return first;
    if (first == kLongLength) return std::nullopt;
    if (first == kReservedLength) malformed(what);
    std::uint64_t length = 0;
    for (unsigned digits = first & ~static_cast<unsigned>(kLongLength); digits > 0; --digits) {
        // Longer than any input; more digits would overflow.
        if (length >> 32U != 0) malformed(what);
        length = length << 8U | reader.u8("length");
    }
    return length;
}

Header readHeader(ByteView bytes, Work& work, const char* what) {
    if (++work.headers > kMaximumHeaders) refuse("the message would take too long to read");
    try {
        ByteReader reader(bytes);
        Header header;
        header.tag = readTag(reader);
        header.tagSize = reader.position();
        header.length = readLength(reader, what);
        header.size = reader.position();
        if (!header.length && (header.tag & kConstructed) == 0) malformed(what);
        if (header.length && *header.length > reader.remaining()) malformed(what);
        if (header.isEndOfContents() && (header.length != 0U || header.size != kEndOfContentsSize))
            malformed(what);
        return header;
    } catch (const base::ShortRead&) {
        malformed(what);
    }
}

/// The length of the contents of indefinite length at the start of `bytes`. Definite elements are skipped
/// whole.
std::size_t indefiniteLength(ByteView bytes, Work& work, const char* what) {
    std::size_t position = 0;
    for (unsigned depth = 1;;) {
        const Header header = readHeader(bytes.subspan(position), work, what);
        if (header.isEndOfContents()) {
            if (--depth == 0) return position;
        } else if (!header.length && ++depth > kMaximumNesting) {
            refuse(std::string(what) + " is nested too deep");
        }
        position += header.size + static_cast<std::size_t>(header.length.value_or(0));
    }
}

Data inDer(const Element& element, Work& work, const char* what, unsigned depth) {
    if (!element.isConstructed()) return withHeader(element.wholeTag, element.contents);
    if (element.tag == (kOctetString | kConstructed))
        return makeElement(kOctetString, octets(element, work, what));
    if (depth == 0) refuse(std::string(what) + " is nested too deep");
    Data contents;
    for (Reader reader(element.contents, work); !reader.atEnd();)
        base::append(contents, inDer(reader.next(what), work, what, depth - 1));
    return withHeader(element.wholeTag, contents);
}

}  // namespace

Element Reader::next(const char* what) {
    const Header header = readHeader(rest_, *work_, what);
    if (header.isEndOfContents()) malformed(what);
    const ByteView after = rest_.subspan(header.size);
    const std::size_t length =
        header.length ? static_cast<std::size_t>(*header.length) : indefiniteLength(after, *work_, what);
    Element element;
    element.tag = header.tag;
    element.wholeTag = rest_.first(header.tagSize);
    element.contents = after.first(length);
    element.whole = rest_.first(header.size + length + (header.length ? 0 : kEndOfContentsSize));
    rest_ = rest_.subspan(element.whole.size());
    return element;
}

Element Reader::expect(std::uint8_t tag, const char* what) {
    const Element element = next(what);
    if (element.tag != tag) malformed(what);
    return element;
}

std::optional<Element> Reader::nextIf(std::uint8_t tag, const char* what) {
    if (rest_.empty() || ByteReader(rest_).u8(what) != tag) return std::nullopt;
    return next(what);
}

void Reader::finish(const char* what) const {
    if (!rest_.empty()) refuse(std::string(what) + " has something after it");
}

Data octets(const Element& element, Work& work, const char* what) {
    if (!element.isConstructed()) return base::toData(element.contents);
    Data all;
    std::vector<Reader> levels = {Reader(element.contents, work)};
    while (!levels.empty()) {
        if (levels.back().atEnd()) {
            levels.pop_back();
            continue;
        }
        const Element piece = levels.back().next(what);
        if (piece.tag == kOctetString) {
            base::append(all, piece.contents);
        } else if (piece.tag == (kOctetString | kConstructed) && levels.size() < kMaximumStringNesting) {
            levels.emplace_back(piece.contents, work);
        } else {
            malformed(what);
        }
    }
    return all;
}

Data inDer(const Element& element, Work& work, const char* what) {
    return inDer(element, work, what, kMaximumNesting);
}

Data makeElement(std::uint8_t tag, ByteView contents) {
    const auto first = static_cast<std::byte>(tag);
    return withHeader(ByteView(&first, 1), contents);
}

}  // namespace pinwell::codesign::ber
