#include "http_service.h"

#include <algorithm>

#include "base/text.h"

namespace pinwell::lumora {
namespace {

int digitOf(char c) {
    if (c >= '0' && c <= '9') return c - '0';
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    if (c >= 'A' && c <= 'F') return c - 'A' + 10;
    return -1;
}

/// A part of a form: text that is UTF-8 and has no byte 0.
std::optional<std::string> decodedPart(std::string_view part) {
    std::string text(part);
    std::replace(text.begin(), text.end(), '+', ' ');
    std::optional<std::string> decoded = percentDecoded(text);
    if (!decoded || decoded->find('\0') != std::string::npos || !base::isUTF8(*decoded)) return std::nullopt;
    return decoded;
}

}  // namespace

std::optional<Query> parseQuery(std::string_view target) {
    target = target.substr(0, target.find('#'));
    const std::size_t mark = target.find('?');
    Query query;
    if (mark == std::string_view::npos) return query;
    std::string_view rest = target.substr(mark + 1);
    while (!rest.empty()) {
        const std::string_view pair = rest.substr(0, rest.find('&'));
        rest.remove_prefix(std::min(pair.size() + 1, rest.size()));
        if (pair.empty()) continue;
        const std::size_t equals = std::min(pair.find('='), pair.size());
        const auto name = decodedPart(pair.substr(0, equals));
        const auto value = decodedPart(pair.substr(std::min(equals + 1, pair.size())));
        if (!name || name->empty() || !value || !query.emplace(*name, *value).second) return std::nullopt;
    }
    return query;
}

std::optional<std::string> percentDecoded(std::string_view text) {
    std::string decoded;
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (text[i] != '%') {
            decoded += text[i];
            continue;
        }
        if (text.size() - i < 3) return std::nullopt;
        const int high = digitOf(text[i + 1]);
        const int low = digitOf(text[i + 2]);
        if (high < 0 || low < 0) return std::nullopt;
        decoded += static_cast<char>(high * 16 + low);
        i += 2;
    }
    return decoded;
}

std::string_view pathOf(std::string_view target) {
    return target.substr(0, target.find_first_of("?#"));
}

bool isJson(std::string_view contentType) {
    std::string_view type = contentType.substr(0, contentType.find(';'));
    while (!type.empty() && (type.back() == ' ' || type.back() == '\t')) type.remove_suffix(1);
    constexpr std::string_view kWanted = "application/json";
    return std::equal(type.begin(), type.end(), kWanted.begin(), kWanted.end(), [](char given, char wanted) {
        return given == wanted || (given >= 'A' && given <= 'Z' && given - 'A' + 'a' == wanted);
    });
}

}  // namespace pinwell::lumora
