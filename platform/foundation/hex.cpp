#include "foundation/hex.h"

namespace pinwell::foundation {
namespace {

std::optional<unsigned> valueOf(char digit) {
    if (digit >= '0' && digit <= '9') return static_cast<unsigned>(digit - '0');
    if (digit >= 'a' && digit <= 'f') return static_cast<unsigned>(digit - 'a') + 10;
    return std::nullopt;
}

}  // namespace

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

}  // namespace pinwell::foundation
