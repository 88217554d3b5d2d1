#include "gate/uri.h"

#include <string_view>

namespace pinwell::gate {

std::string uriOf(const std::string& path) {
    constexpr std::string_view kPlain = "/-._~";
    constexpr std::string_view kDigits = "0123456789ABCDEF";
    std::string uri = path.starts_with('/') ? "file://" : "";
    for (const char c : path) {
        const bool isAlphanumeric =
            (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9');
        if (isAlphanumeric || kPlain.find(c) != std::string_view::npos) {
            uri += c;
        } else {
            const auto byte = static_cast<unsigned char>(c);
            uri += '%';
            uri += kDigits[byte >> 4U];
            uri += kDigits[byte & 0xFU];
        }
    }
    return uri;
}

}  // namespace pinwell::gate
