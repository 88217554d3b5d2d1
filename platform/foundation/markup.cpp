#include "foundation/markup.h"

#include <array>
#include <utility>

#include "foundation/description.h"

namespace pinwell::foundation {

namespace {

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

}  // namespace

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

}  // namespace pinwell::foundation
