#include "base/text.h"

#include <fmt/format.h>

#include <algorithm>
#include <array>
#include <utility>

namespace pinwell::base {
namespace {

std::optional<unsigned> valueOf(char digit) {
    if (digit >= '0' && digit <= '9') return static_cast<unsigned>(digit - '0');
    if (digit >= 'a' && digit <= 'f') return static_cast<unsigned>(digit - 'a') + 10;
    return std::nullopt;
}

constexpr std::string_view kAlphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
constexpr char kPadding = '=';
constexpr std::uint8_t kNotInAlphabet = 0xFF;

constexpr std::array<std::uint8_t, 256> kValues = [] {
    std::array<std::uint8_t, 256> values{};
    values.fill(kNotInAlphabet);
    for (std::size_t i = 0; i < kAlphabet.size(); ++i)
        values[static_cast<unsigned char>(kAlphabet[i])] = static_cast<std::uint8_t>(i);
    return values;
}();

// Decodes two to four characters, without the padding, to one to three bytes.
bool decodeGroup(std::string_view group, Data& out) {
    std::uint32_t bits = 0;
    for (const char c : group) {
        const std::uint8_t value = kValues[static_cast<unsigned char>(c)];
        if (value == kNotInAlphabet) return false;
        bits = (bits << 6U) | value;
    }
    bits <<= 6U * static_cast<unsigned>(4 - group.size());
    const std::size_t bytes = group.size() - 1;
    // The bits that the padding cuts off must be zero; otherwise one buffer would have several encodings.
    if ((bits & (0xFFFFFFU >> (8U * bytes))) != 0) return false;
    for (std::size_t i = 0; i < bytes; ++i, bits <<= 8U) out.push_back(static_cast<std::byte>(bits >> 16U));
    return true;
}

// The bytes after a lead byte: the length of the sequence, and the range of the second byte. This range
// excludes overlong forms (E0, F0), surrogates (ED) and values past the last code point (F4).
struct Sequence {
    std::size_t length = 0;
    unsigned char low = 0x80;
    unsigned char high = 0xBF;
};

Sequence sequenceFor(unsigned char lead) noexcept {
    if (lead < 0x80) return {1};
    if (lead >= 0xC2 && lead <= 0xDF) return {2};
    if (lead == 0xE0) return {3, 0xA0, 0xBF};
    if (lead == 0xED) return {3, 0x80, 0x9F};
    if (lead >= 0xE1 && lead <= 0xEF) return {3};
    if (lead == 0xF0) return {4, 0x90, 0xBF};
    if (lead >= 0xF1 && lead <= 0xF3) return {4};
    if (lead == 0xF4) return {4, 0x80, 0x8F};
    return {};
}

void appendEscaped(std::string& out, std::string_view bytes) {
    if (bytes == "\n")
        out += "\\n";
    else if (bytes == "\r")
        out += "\\r";
    else if (bytes == "\t")
        out += "\\t";
    else
        for (const char c : bytes) out += fmt::format("\\x{:02x}", static_cast<unsigned char>(c));
}

/// Separators of lines and paragraphs, and characters that control the direction of writing: marks,
/// embeddings, overrides and isolates (UAX #9).
constexpr std::array<std::pair<std::string_view, std::string_view>, 14> kMisleading{{
    {"\xE2\x80\xA8", "\\u2028"},
    {"\xE2\x80\xA9", "\\u2029"},
    {"\xD8\x9C", "\\u061c"},
    {"\xE2\x80\x8E", "\\u200e"},
    {"\xE2\x80\x8F", "\\u200f"},
    {"\xE2\x80\xAA", "\\u202a"},
    {"\xE2\x80\xAB", "\\u202b"},
    {"\xE2\x80\xAC", "\\u202c"},
    {"\xE2\x80\xAD", "\\u202d"},
    {"\xE2\x80\xAE", "\\u202e"},
    {"\xE2\x81\xA6", "\\u2066"},
    {"\xE2\x81\xA7", "\\u2067"},
    {"\xE2\x81\xA8", "\\u2068"},
    {"\xE2\x81\xA9", "\\u2069"},
}};

void replaceAll(std::string& text, std::string_view part, std::string_view other) {
    for (std::size_t at = 0; (at = text.find(part, at)) != std::string::npos; at += other.size())
        text.replace(at, part.size(), other);
}

struct Unit {
    std::string_view name;
    unsigned shift;       // one of it is 2^shift bytes
    std::uint64_t scale;  // 10^fraction digits
};

constexpr std::array kUnits{Unit{"KB", 10, 1},   Unit{"MB", 20, 10},  Unit{"GB", 30, 100},
                            Unit{"TB", 40, 100}, Unit{"PB", 50, 100}, Unit{"EB", 60, 100}};

// The count in the unit's smallest shown fraction, halves rounded up.
std::uint64_t scaled(std::uint64_t bytes, const Unit& unit) {
    const std::uint64_t whole = bytes >> unit.shift;
    std::uint64_t rest = bytes & ((std::uint64_t{1} << unit.shift) - 1);
    unsigned shift = unit.shift;
    if (shift > 50) {  // makes room for the multiplication; no shown digit depends on the lost bits
        rest >>= shift - 50;
        shift = 50;
    }
    const std::uint64_t half = std::uint64_t{1} << (shift - 1);
    return whole * unit.scale + ((rest * unit.scale + half) >> shift);
}

std::string decimal(std::uint64_t count, std::uint64_t scale) {
    std::string text = fmt::format("{}", count / scale);
    std::uint64_t rest = count % scale;
    if (rest != 0) text += '.';
    for (std::uint64_t digit = scale / 10; rest != 0; digit /= 10) {
        text += static_cast<char>('0' + rest / digit);
        rest %= digit;
    }
    return text;
}

}  // namespace

std::string toHex(ByteView bytes) {
    constexpr std::string_view digits = "0123456789abcdef";
    std::string text;
    text.reserve(bytes.size() * 2);
    for (const std::byte byte : bytes) {
        const auto value = std::to_integer<unsigned>(byte);
        text += digits[value >> 4U];
        text += digits[value & 0xFU];
    }
    return text;
}

std::optional<Data> parseHex(std::string_view text) {
    if (text.size() % 2 != 0) return std::nullopt;
    Data bytes;
    bytes.reserve(text.size() / 2);
    for (std::size_t i = 0; i < text.size(); i += 2) {
        const auto high = valueOf(text[i]);
        const auto low = valueOf(text[i + 1]);
        if (!high || !low) return std::nullopt;
        bytes.push_back(static_cast<std::byte>(*high << 4U | *low));
    }
    return bytes;
}

std::optional<Data> decodeBase64(std::string_view text) {
    if (text.size() % 4 != 0) return std::nullopt;
    Data bytes;
    bytes.reserve(text.size() / 4 * 3);
    while (!text.empty()) {
        std::string_view group = text.substr(0, 4);
        text.remove_prefix(4);
        if (text.empty()) {
            if (group.ends_with(kPadding)) group.remove_suffix(1);
            if (group.ends_with(kPadding)) group.remove_suffix(1);
        }
        if (!decodeGroup(group, bytes)) return std::nullopt;
    }
    return bytes;
}

std::string encodeBase64(ByteView bytes) {
    std::string text;
    text.reserve((bytes.size() + 2) / 3 * 4);
    while (!bytes.empty()) {
        const ByteView group = bytes.first(std::min<std::size_t>(bytes.size(), 3));
        bytes = bytes.subspan(group.size());
        std::uint32_t bits = 0;
        for (std::size_t i = 0; i < 3; ++i)
            bits = (bits << 8U) | (i < group.size() ? std::to_integer<std::uint32_t>(group[i]) : 0U);
        for (std::size_t i = 0; i < 4; ++i)
            text += i <= group.size() ? kAlphabet[(bits >> (18U - 6U * i)) & 0x3FU] : kPadding;
    }
    return text;
}

std::size_t utf8SequenceLength(std::string_view text) noexcept {
    if (text.empty()) return 0;
    const auto byte = [&](std::size_t i) { return static_cast<unsigned char>(text[i]); };
    const Sequence sequence = sequenceFor(byte(0));
    if (sequence.length > text.size()) return 0;
    if (sequence.length > 1 && (byte(1) < sequence.low || byte(1) > sequence.high)) return 0;
    for (std::size_t i = 2; i < sequence.length; ++i)
        if (byte(i) < 0x80 || byte(i) > 0xBF) return 0;
    return sequence.length;
}

bool isControlCharacter(std::string_view sequence) noexcept {
    const auto first = static_cast<unsigned char>(sequence[0]);
    if (sequence.size() == 1) return first < 0x20 || first == 0x7F;
    return sequence.size() == 2 && first == 0xC2 && static_cast<unsigned char>(sequence[1]) < 0xA0;
}

bool isUTF8(std::string_view text) noexcept {
    while (!text.empty()) {
        const std::size_t length = utf8SequenceLength(text);
        if (length == 0) return false;
        text.remove_prefix(length);
    }
    return true;
}

std::string escapeForTerminal(std::string_view text, std::string_view alsoEscaped) {
    std::string out;
    out.reserve(text.size());
    while (!text.empty()) {
        const std::size_t length = utf8SequenceLength(text);
        const std::string_view sequence = text.substr(0, std::max<std::size_t>(length, 1));
        if (length == 0 || isControlCharacter(sequence)) {
            appendEscaped(out, sequence);
        } else {
            if (alsoEscaped.find(sequence[0]) != std::string_view::npos) out += '\\';
            out += sequence;
        }
        text.remove_prefix(sequence.size());
    }
    return out;
}

std::string escapeForDisplay(std::string_view text) {
    std::string result = escapeForTerminal(text);
    for (const auto& [mark, name] : kMisleading) replaceAll(result, mark, name);
    return result;
}

std::string markupText(std::string_view text) {
    std::string result;
    for (const char c : escapeForDisplay(text)) {
        switch (c) {
            case '&':
                result += "&amp;";
                break;
            case '<':
                result += "&lt;";
                break;
            case '>':
                result += "&gt;";
                break;
            case '"':
                result += "&quot;";
                break;
            case '\'':
                result += "&#39;";
                break;
            default:
                result += c;
        }
    }
    // Two code points that XML forbids, but UTF-8 can encode.
    for (const std::string_view none : {"\xEF\xBF\xBE", "\xEF\xBF\xBF"})
        replaceAll(result, none, "\xEF\xBF\xBD");
    return result;
}

std::string formatByteCount(std::uint64_t bytes) {
    if (bytes == 0) return "Zero KB";
    if (bytes == 1) return "1 byte";
    if (bytes < 1024) return fmt::format("{} bytes", bytes);
    for (const Unit& unit : kUnits) {
        // A count that rounds up to 1024 of a unit is shown as 1 of the next.
        const std::uint64_t count = scaled(bytes, unit);
        if (count < 1024 * unit.scale) return fmt::format("{} {}", decimal(count, unit.scale), unit.name);
    }
    return {};  // not reached: 2^64 bytes are 16 of the last unit
}

}  // namespace pinwell::base
