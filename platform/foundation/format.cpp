#include "foundation/format.h"

#include <algorithm>
#include <cstdio>

namespace pinwell::foundation::format_detail {
namespace {

// Longest field for the widths and precisions in our formats.
constexpr std::size_t kFieldSize = 128;

std::string formatInteger(std::string_view specification, const Conversion& conversion,
                          const Argument& argument) {
    // Rebuild the conversion for one fixed integer width, so that the promoted argument always fits it.
    std::string flags(specification.substr(0, specification.find_first_of("hlztjdiuxXoc", 1)));
    char field[kFieldSize];
    int written = 0;
    if (conversion.letter == 'd' || conversion.letter == 'i') {
        std::int64_t value = static_cast<std::int64_t>(argument.integer);
        if (conversion.wants == ArgumentKind::int32) value = static_cast<std::int32_t>(argument.integer);
        if (conversion.wants == ArgumentKind::int8)
            value = std::int64_t{static_cast<std::int8_t>(argument.integer)};  // NOLINT(*-signed-char-misuse)
        flags += "lld";
        written = std::snprintf(field, sizeof field, flags.c_str(), static_cast<long long>(value));
    } else {
        std::uint64_t value = argument.integer;
        if (conversion.wants == ArgumentKind::int32) value = static_cast<std::uint32_t>(argument.integer);
        if (conversion.wants == ArgumentKind::int8) value = static_cast<std::uint8_t>(argument.integer);
        flags += "ll";
        flags += conversion.letter;
        written = std::snprintf(field, sizeof field, flags.c_str(), static_cast<unsigned long long>(value));
    }
    if (written < 0) return {};
    return {field, std::min(static_cast<std::size_t>(written), kFieldSize - 1)};
}

// Width and precision of a text conversion count bytes, as in printf.
std::string formatText(std::string_view specification, std::string text) {
    bool left = false;
    std::size_t width = 0;
    std::size_t at = 1;
    for (; at < specification.size() && isOneOf(specification[at], "-+ #0"); ++at)
        left |= specification[at] == '-';
    for (; at < specification.size() && specification[at] >= '0' && specification[at] <= '9'; ++at)
        width = width * 10 + static_cast<std::size_t>(specification[at] - '0');
    if (at < specification.size() && specification[at] == '.') {
        std::size_t precision = 0;
        for (++at; at < specification.size() && specification[at] >= '0' && specification[at] <= '9'; ++at)
            precision = precision * 10 + static_cast<std::size_t>(specification[at] - '0');
        if (text.size() > precision) text.resize(precision);
    }
    if (text.size() < width) text.insert(left ? text.size() : 0, width - text.size(), ' ');
    return text;
}

}  // namespace

std::string formatArguments(std::string_view format, std::span<const Argument> arguments) {
    std::string out;
    out.reserve(format.size() + 64);
    std::size_t next = 0;
    for (std::size_t at = 0; at < format.size();) {
        if (format[at] != '%') {
            out += format[at++];
            continue;
        }
        const Conversion conversion = scanConversion(format, at);
        const std::string_view specification = format.substr(at, conversion.end - at);
        at = conversion.end;
        if (conversion.letter == '%') {
            out += '%';
            continue;
        }
        const Argument& argument = arguments[next++];
        if (conversion.letter == 'c') {
            const char character = static_cast<char>(argument.integer);
            out += formatText(specification, escapeForTerminal({&character, 1}));
        } else if (conversion.wants == ArgumentKind::object || conversion.wants == ArgumentKind::text) {
            out += formatText(specification, argument.text);
        } else {
            out += formatInteger(specification, conversion, argument);
        }
    }
    return out;
}

}  // namespace pinwell::foundation::format_detail
