// Requests and responses as values.
#include <algorithm>

#include "https/session.h"

namespace pinwell::https {
namespace {

char lowerCase(char c) {
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

}  // namespace

bool CaseInsensitiveLess::operator()(std::string_view a, std::string_view b) const noexcept {
    return std::lexicographical_compare(a.begin(), a.end(), b.begin(), b.end(),
                                        [](char x, char y) { return lowerCase(x) < lowerCase(y); });
}

void Request::addHeader(std::string_view name, std::string_view value) {
    const auto [field, isNew] = headers.try_emplace(std::string(name), value);
    if (!isNew) field->second.append(", ").append(value);
}

std::optional<std::string> HTTPResponse::header(std::string_view name) const {
    const auto field = headers.find(name);
    if (field == headers.end()) return std::nullopt;
    return field->second;
}

}  // namespace pinwell::https

namespace pinwell::foundation {

std::string Description<https::HTTPResponse>::of(const https::HTTPResponse& response) {
    std::string text = "{ URL: " + escapeForTerminal(response.url.absoluteString()) +
                       " } { Status Code: " + std::to_string(response.status) + ", Headers { ";
    for (const auto& [name, value] : response.headers)
        text += quoteForPropertyList(name) + " = " + quoteForPropertyList(value) + "; ";
    return text + "} }";
}

}  // namespace pinwell::foundation
