#include "values/format.h"

#include <fmt/chrono.h>
#include <fmt/format.h>

#include <algorithm>
#include <cstdio>
#include <ctime>

#include "base/text.h"

namespace pinwell::values {
namespace {

using base::ByteView;
using base::Error;
using base::escapeForTerminal;

// A longer byte buffer shows only its first and last bytes.
constexpr std::size_t kWholeExcerpt = 24;
constexpr std::size_t kExcerptHead = 16;
constexpr std::size_t kExcerptTail = 4;

// The dates with a four-digit year; a date from a file may have any value.
constexpr std::int64_t kFirstShown = -62135596800;  // 0001-01-01
constexpr std::int64_t kLastShown = 253402300799;   // 9999-12-31

constexpr unsigned kIndentStep = 4;
constexpr unsigned kDeepestIndent = 16;  // deeper lines are not indented further

void appendLineStart(std::string& out, unsigned indent) {
    out.append(std::size_t{std::min(indent, kDeepestIndent)} * kIndentStep, ' ');
}

std::string decimal(double number) {
    return fmt::format("{}", number);
}

// Containers are written into one text, not joined from their elements' texts, and the indentation is
// limited. Otherwise the text of a deeply nested document would grow with length times depth.
void append(std::string& out, const Array& array, unsigned indent);
void append(std::string& out, const Dictionary& dictionary, unsigned indent);

void append(std::string& out, const Value& value, unsigned indent) {
    if (value.array() != nullptr)
        append(out, *value.array(), indent);
    else if (value.dictionary() != nullptr)
        append(out, *value.dictionary(), indent);
    else
        out += value.describe(indent);
}

void append(std::string& out, const Array& array, unsigned indent) {
    out += "(\n";
    std::size_t left = array.size();
    for (const Value& element : array) {
        appendLineStart(out, indent + 1);
        append(out, element, indent + 1);
        out += --left > 0 ? ",\n" : "\n";
    }
    appendLineStart(out, indent);
    out += ')';
}

void append(std::string& out, const Dictionary& dictionary, unsigned indent) {
    out += "{\n";
    for (const auto& [key, value] : dictionary) {
        appendLineStart(out, indent + 1);
        out += quoteForPropertyList(key) + " = ";
        append(out, value, indent + 1);
        out += ";\n";
    }
    appendLineStart(out, indent);
    out += '}';
}

std::string hexWords(ByteView bytes) {
    std::string text;
    for (std::size_t i = 0; i < bytes.size(); i += 4) {
        if (i > 0) text += ' ';
        text += base::toHex(bytes.subspan(i, std::min<std::size_t>(4, bytes.size() - i)));
    }
    return text;
}

}  // namespace

std::string quoteForPropertyList(std::string_view text) {
    const auto bare = [](char c) {
        return (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') ||
               std::string_view("._/$-").find(c) != std::string_view::npos;
    };
    if (!text.empty() && std::all_of(text.begin(), text.end(), bare)) return std::string(text);
    return '"' + escapeForTerminal(text, "\"\\") + '"';
}

std::string describe(ByteView bytes) {
    if (bytes.empty()) return "{length = 0, bytes = 0x}";
    if (bytes.size() <= kWholeExcerpt)
        return fmt::format("{{length = {}, bytes = 0x{}}}", bytes.size(), hexWords(bytes));
    return fmt::format("{{length = {}, bytes = 0x{} ... {}}}", bytes.size(),
                       hexWords(bytes.first(kExcerptHead)), hexWords(bytes.last(kExcerptTail)));
}

std::string describe(Date date) {
    if (date.seconds < kFirstShown || date.seconds > kLastShown) return fmt::format("{} s", date.seconds);
    return fmt::format("{:%Y-%m-%d %H:%M:%S} +0000", fmt::gmtime(static_cast<std::time_t>(date.seconds)));
}

std::string describe(const URL& url) {
    return escapeForTerminal(url.absoluteString());
}

std::string describe(const Error& error) {
    const std::string text =
        fmt::format("Error Domain={} Code={} \"{}\"", escapeForTerminal(error.domain()), error.code(),
                    escapeForTerminal(error.localizedFailureReason(), "\"\\"));
    std::string known;
    const auto add = [&](std::string_view key, const std::string& description) {
        known += fmt::format("{}{}={}", known.empty() ? "" : ", ", key, description);
    };
    if (!error.url().empty()) add("FailingURL", escapeForTerminal(error.url()));
    if (!error.path().empty()) add("FilePath", escapeForTerminal(error.path()));
    // In braces, not in quotes: in a chain of errors, quotes would double the backslashes at every link.
    if (error.underlying() != nullptr) add("UnderlyingError", "{" + describe(*error.underlying()) + "}");
    return known.empty() ? text : text + " UserInfo={" + known + "}";
}

std::string describe(const Value& value) {
    if (value.string() != nullptr) return escapeForTerminal(*value.string());
    if (value.isNull()) return "<null>";
    if (value.date() != nullptr) return describe(*value.date());
    if (value.url() != nullptr) return describe(*value.url());
    if (value.error() != nullptr) return describe(*value.error());
    if (value.real() != nullptr) return decimal(*value.real());
    return value.describe(0);
}

std::string describe(const Array& array, unsigned indent) {
    std::string text;
    append(text, array, indent);
    return text;
}

std::string describe(const Dictionary& dictionary, unsigned indent) {
    std::string text;
    append(text, dictionary, indent);
    return text;
}

std::string Value::describe(unsigned indent) const {
    struct Visitor {
        unsigned indent;
        std::string operator()(std::monostate) const { return std::string(kNilDescription); }
        std::string operator()(Null) const { return "\"<null>\""; }
        std::string operator()(bool flag) const { return flag ? "1" : "0"; }
        std::string operator()(std::int64_t number) const { return fmt::format("{}", number); }
        std::string operator()(std::uint64_t number) const { return fmt::format("{}", number); }
        std::string operator()(double number) const { return quoteForPropertyList(decimal(number)); }
        std::string operator()(const std::string& text) const { return quoteForPropertyList(text); }
        std::string operator()(Date date) const { return quoteForPropertyList(values::describe(date)); }
        std::string operator()(const std::shared_ptr<const base::Data>& data) const {
            return values::describe(ByteView(*data));
        }
        std::string operator()(const std::shared_ptr<const URL>& url) const {
            return quoteForPropertyList(url->absoluteString());
        }
        std::string operator()(const std::shared_ptr<const Error>& error) const {
            return quoteForPropertyList(values::describe(*error));
        }
        std::string operator()(const std::shared_ptr<const Array>& array) const {
            return values::describe(*array, indent);
        }
        std::string operator()(const std::shared_ptr<const Dictionary>& dictionary) const {
            return values::describe(*dictionary, indent);
        }
    };
    return std::visit(Visitor{indent}, content_);
}

namespace format_detail {
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

}  // namespace format_detail

}  // namespace pinwell::values
