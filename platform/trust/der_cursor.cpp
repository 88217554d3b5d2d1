#include "trust/der_cursor.h"

#include <algorithm>
#include <chrono>
#include <vector>

#include "foundation/byte_reader.h"

namespace pinwell::trust::der {
namespace {

using foundation::ByteReader;
using foundation::ByteView;
using foundation::Date;
using foundation::ShortRead;

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
