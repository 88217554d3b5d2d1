#include "foundation/base64.h"

#include <algorithm>
#include <array>

namespace pinwell::foundation {
namespace {

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

}  // namespace

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

}  // namespace pinwell::foundation
