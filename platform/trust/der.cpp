#include "trust/der.h"

#include <algorithm>
#include <chrono>
#include <limits>
#include <vector>

#include "base/byte_io.h"

namespace pinwell::trust::der {

namespace {

using base::ByteReader;
using base::ByteView;
using base::ShortRead;

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

namespace {

using values::Date;

constexpr std::byte kSignBit{0x80};
constexpr std::uint8_t kMoreDigits = 0x80;  // of an arc's base-128 digits
constexpr std::uint8_t kArcDigit = 0x7F;
constexpr unsigned kDigitBits = 7;
constexpr std::uint8_t kTrue = 0xFF;

/// A number of any size, in base 10^9, least significant first. Arcs have no maximum.
class DecimalNumber {
  public:
    void shiftIn(std::uint8_t digit) {
        std::uint64_t carry = digit;
        for (std::uint32_t& limb : limbs_) {
            carry += std::uint64_t{limb} << kDigitBits;
            limb = static_cast<std::uint32_t>(carry % kBase);
            carry /= kBase;
        }
        if (carry != 0) limbs_.push_back(static_cast<std::uint32_t>(carry));
    }

    bool isBelow(std::uint32_t limit) const {
        return limbs_.empty() || (limbs_.size() == 1 && limbs_.front() < limit);
    }

    /// `amount` must not be larger than the number.
    void subtract(std::uint32_t amount) {
        for (std::size_t i = 0; amount != 0; ++i) {
            const bool borrows = limbs_[i] < amount;
            limbs_[i] = static_cast<std::uint32_t>(limbs_[i] + (borrows ? kBase : 0) - amount);
            amount = borrows ? 1 : 0;
        }
        while (!limbs_.empty() && limbs_.back() == 0) limbs_.pop_back();
    }

    std::uint32_t low() const { return limbs_.empty() ? 0 : limbs_.front(); }

    std::string text() const {
        if (limbs_.empty()) return "0";
        std::string result = std::to_string(limbs_.back());
        for (std::size_t i = limbs_.size() - 1; i-- > 0;) {
            const std::string limb = std::to_string(limbs_[i]);
            result.append(kBaseDigits - limb.size(), '0').append(limb);
        }
        return result;
    }

  private:
    static constexpr std::uint64_t kBase = 1'000'000'000;
    static constexpr std::size_t kBaseDigits = 9;

    std::vector<std::uint32_t> limbs_;
};

DecimalNumber readArc(ByteReader& reader) {
    DecimalNumber number;
    std::uint8_t byte = reader.u8("arc");
    if (byte == kMoreDigits) throw Malformed("an arc begins with a zero digit");
    while ((byte & kMoreDigits) != 0) {
        number.shiftIn(byte & kArcDigit);
        byte = reader.u8("arc");
    }
    number.shiftIn(byte);
    return number;
}

/// The first two arcs share a number: 40 * first + second (X.690, 8.19.4).
std::string firstArcs(DecimalNumber number) {
    constexpr std::uint32_t kSecondArcs = 40;
    if (number.isBelow(2 * kSecondArcs)) {
        const std::uint32_t value = number.low();
        return std::to_string(value / kSecondArcs) + "." + std::to_string(value % kSecondArcs);
    }
    number.subtract(2 * kSecondArcs);
    return "2." + number.text();
}

/// Reads the decimal digits of a time's text, field by field.
class TimeText {
  public:
    explicit TimeText(ByteView text) : reader_(text) {}

    int number(int digits) {
        int value = 0;
        for (int i = 0; i < digits; ++i) {
            const std::uint8_t digit = reader_.u8("digit");
            if (digit < '0' || digit > '9') throw Malformed("a time holds something other than digits");
            value = value * 10 + (digit - '0');
        }
        return value;
    }

    void zone() {
        if (reader_.u8("zone") != 'Z' || !reader_.atEnd()) throw Malformed("a time does not end with Z");
    }

  private:
    ByteReader reader_;
};

Date readTimeText(ByteView text, bool hasCentury) {
    TimeText fields(text);
    int year = fields.number(hasCentury ? 4 : 2);
    if (!hasCentury) year += year >= 50 ? 1900 : 2000;
    const int month = fields.number(2);
    const int day = fields.number(2);
    const int hour = fields.number(2);
    const int minute = fields.number(2);
    const int second = fields.number(2);
    fields.zone();

    const std::chrono::year_month_day date{std::chrono::year(year),
                                           std::chrono::month(static_cast<unsigned>(month)),
                                           std::chrono::day(static_cast<unsigned>(day))};
    if (!date.ok() || hour > 23 || minute > 59 || second > 59)
        throw Malformed("there is no such date or time of day");
    const std::int64_t days = std::chrono::sys_days(date).time_since_epoch().count();
    return {((days * 24 + hour) * 60 + minute) * 60 + second};
}

}  // namespace

void checkInteger(ByteView contents) {
    if (contents.empty()) throw Malformed("an integer has no contents");
    if (contents.size() == 1) return;
    // The first nine bits must not all be equal (X.690, 8.3.2).
    const bool secondIsSet = (contents.subspan(1).front() & kSignBit) != std::byte{0};
    if (contents.front() == (secondIsSet ? std::byte{0xFF} : std::byte{0}))
        throw Malformed("an integer is not in the fewest bytes");
}

ByteView naturalNumber(ByteView contents) {
    checkInteger(contents);
    if ((contents.front() & kSignBit) != std::byte{0}) throw Malformed("a number is negative");
    return contents.front() == std::byte{0} ? contents.subspan(1) : contents;
}

ByteView bitString(ByteView contents) {
    if (contents.empty()) throw Malformed("a bit string has no contents");
    const auto unused = std::to_integer<unsigned>(contents.front());
    const ByteView bytes = contents.subspan(1);
    if (unused == 0) return bytes;
    if (unused > 7 || bytes.empty()) throw Malformed("a bit string has no such unused bits");
    if ((std::to_integer<unsigned>(bytes.back()) & ((1U << unused) - 1)) != 0)
        throw Malformed("unused bits of a bit string are set");
    return bytes;
}

ByteView wholeBytes(ByteView contents) {
    if (contents.empty() || contents.front() != std::byte{0})
        throw Malformed("a bit string does not fill whole bytes");
    return contents.subspan(1);
}

std::string dottedOid(ByteView contents) {
    if (contents.empty() || contents.size() > kMaximumOidSize)
        throw Malformed("an object identifier is empty or too long");
    try {
        ByteReader reader(contents);
        std::string text = firstArcs(readArc(reader));
        while (!reader.atEnd()) text.append(1, '.').append(readArc(reader).text());
        return text;
    } catch (const ShortRead&) {
        throw Malformed("an object identifier ends inside an arc");
    }
}

Date readTime(const Element& element) {
    const bool hasCentury = element.tag == kGeneralizedTime;
    if (!hasCentury && element.tag != kUtcTime) throw Malformed("a time is of another type");
    try {
        return readTimeText(element.contents, hasCentury);
    } catch (const ShortRead&) {
        throw Malformed("a time is cut short");
    }
}

Element Cursor::any() {
    const std::optional<Element> element = readElement(rest_);
    if (!element) throw Malformed("an element is cut short, or its length is not in the shortest form");
    rest_ = rest_.subspan(element->whole.size());
    return *element;
}

Element Cursor::take(Tag tag) {
    std::optional<Element> element = takeIf(tag);
    if (!element) throw Malformed("an element is missing or of another type");
    return *element;
}

std::optional<Element> Cursor::takeIf(Tag tag) {
    if (atEnd()) return std::nullopt;
    const ByteView before = rest_;
    const Element element = any();
    if (element.tag == tag) return element;
    rest_ = before;
    return std::nullopt;
}

void Cursor::expectEnd() const {
    if (!atEnd()) throw Malformed("elements are left over");
}

bool Cursor::boolean() {
    const ByteView contents = take(kBoolean).contents;
    if (contents.size() != 1) throw Malformed("a boolean is not of one byte");
    const auto value = std::to_integer<std::uint8_t>(contents.front());
    if (value != 0 && value != kTrue) throw Malformed("a boolean is neither 00 nor FF");
    return value == kTrue;
}

}  // namespace pinwell::trust::der
