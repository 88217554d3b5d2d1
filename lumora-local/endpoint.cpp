#include "lumora-local/endpoint.h"

#include <arpa/inet.h>

#include <algorithm>
#include <array>
#include <charconv>

namespace pinwell::lumora {
namespace {

constexpr std::size_t kMaximumHostLength = 253;
constexpr std::size_t kMaximumLabelLength = 63;

std::optional<std::string> canonicalAddress(const std::string& text) {
    std::array<unsigned char, 16> address{};
    std::array<char, INET6_ADDRSTRLEN> canonical{};
    for (const int family : {AF_INET, AF_INET6}) {
        if (inet_pton(family, text.c_str(), address.data()) == 1 &&
            inet_ntop(family, address.data(), canonical.data(), canonical.size()) != nullptr) {
            return std::string(canonical.data());
        }
    }
    return std::nullopt;
}

bool isLetterOrDigit(char c) {
    return (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9');
}

bool isLabel(std::string_view label) {
    return !label.empty() && label.size() <= kMaximumLabelLength && isLetterOrDigit(label.front()) &&
           isLetterOrDigit(label.back()) &&
           std::all_of(label.begin(), label.end(), [](char c) { return isLetterOrDigit(c) || c == '-'; });
}

bool isDigit(char c) {
    return c >= '0' && c <= '9';
}

bool isName(std::string_view text) {
    if (text.empty() || text.size() > kMaximumHostLength) return false;
    std::string_view lastLabel;
    for (std::size_t start = 0; start <= text.size();) {
        const std::size_t end = std::min(text.find('.', start), text.size());
        lastLabel = text.substr(start, end - start);
        if (!isLabel(lastLabel)) return false;
        start = end + 1;
    }
    // "300.1.1.1" is a mistyped address, not a name.
    return !std::all_of(lastLabel.begin(), lastLabel.end(), isDigit);
}

std::optional<std::uint16_t> parsePort(std::string_view text) {
    std::uint16_t port = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), port);
    if (error != std::errc{} || end != text.data() + text.size()) return std::nullopt;
    return port;
}

std::optional<Endpoint> makeEndpoint(std::string_view host, std::optional<std::uint16_t> port) {
    std::optional<std::string> canonical = canonicalHost(host);
    if (!canonical || !port) return std::nullopt;
    return Endpoint{*std::move(canonical), *port};
}

}  // namespace

std::optional<std::string> canonicalHost(std::string_view text) {
    std::string host(text);
    if (host.find('\0') != std::string::npos) return std::nullopt;
    if (auto address = canonicalAddress(host)) return address;
    std::transform(host.begin(), host.end(), host.begin(),
                   [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; });
    if (!isName(host)) return std::nullopt;
    return host;
}

bool isAddress(const std::string& host) {
    return canonicalAddress(host).has_value();
}

bool isWildcard(const std::string& host) {
    return host == "0.0.0.0" || host == "::";
}

std::optional<Endpoint> parseEndpoint(std::string_view text, std::uint16_t defaultPort) {
    if (text.starts_with('[')) {
        const std::size_t close = text.find(']');
        if (close == std::string_view::npos) return std::nullopt;
        const std::string_view host = text.substr(1, close - 1);
        const std::string_view rest = text.substr(close + 1);
        if (host.find(':') == std::string_view::npos) return std::nullopt;
        if (rest.empty()) return makeEndpoint(host, defaultPort);
        if (!rest.starts_with(':')) return std::nullopt;
        return makeEndpoint(host, parsePort(rest.substr(1)));
    }
    const std::size_t colon = text.find(':');
    const bool bareAddress =
        colon != std::string_view::npos && text.find(':', colon + 1) != std::string_view::npos;
    if (colon == std::string_view::npos || bareAddress) return makeEndpoint(text, defaultPort);
    return makeEndpoint(text.substr(0, colon), parsePort(text.substr(colon + 1)));
}

std::string toString(const Endpoint& endpoint) {
    const bool brackets = endpoint.host.find(':') != std::string::npos;
    const std::string host = brackets ? "[" + endpoint.host + "]" : endpoint.host;
    return host + ":" + std::to_string(endpoint.port);
}

}  // namespace pinwell::lumora
