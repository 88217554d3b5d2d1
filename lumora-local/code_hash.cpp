#include "lumora-local/code_hash.h"

namespace pinwell::lumora {
namespace {

std::optional<unsigned> hexDigit(char c) {
    if (c >= '0' && c <= '9') return static_cast<unsigned>(c - '0');
    if (c >= 'a' && c <= 'f') return static_cast<unsigned>(c - 'a') + 10;
    return std::nullopt;
}

}  // namespace

std::optional<foundation::Data> parseHex(std::string_view text) {
    if (text.size() % 2 != 0) return std::nullopt;
    foundation::Data bytes;
    for (std::size_t i = 0; i < text.size(); i += 2) {
        const auto high = hexDigit(text[i]);
        const auto low = hexDigit(text[i + 1]);
        if (!high || !low) return std::nullopt;
        bytes.push_back(static_cast<std::byte>(*high * 16 + *low));
    }
    return bytes;
}

std::optional<std::size_t> hashLength(std::uint32_t algorithm) {
    if (algorithm <= 3) return 20;
    if (algorithm == 4) return 48;
    return std::nullopt;
}

std::string recordName(const CodeHash& hash) {
    const std::string hex = foundation::toHex(hash.hash);
    return hash.algorithm == 0 ? "1/" + hex : "2/" + std::to_string(hash.algorithm) + "/" + hex;
}

std::optional<CodeHash> parseRecordName(std::string_view name) {
    CodeHash parsed;
    if (name.starts_with("1/")) {
        name.remove_prefix(2);
    } else {
        // Every known digest type is one digit.
        if (name.size() < 4 || !name.starts_with("2/") || name[2] < '1' || name[2] > '9' || name[3] != '/') {
            return std::nullopt;
        }
        parsed.algorithm = static_cast<std::uint32_t>(name[2] - '0');
        name.remove_prefix(4);
    }
    const std::optional<std::size_t> length = hashLength(parsed.algorithm);
    if (!length || name.size() != 2 * *length) return std::nullopt;
    std::optional<foundation::Data> hash = parseHex(name);
    if (!hash) return std::nullopt;
    parsed.hash = *std::move(hash);
    return parsed;
}

}  // namespace pinwell::lumora
