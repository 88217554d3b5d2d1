#include "foundation/description.h"

#include <fmt/format.h>

#include <algorithm>

#include "foundation/utf8.h"
#include "foundation/value.h"

namespace pinwell::foundation {
namespace {

// A longer byte buffer shows only its first and last bytes.
constexpr std::size_t kWholeExcerpt = 24;
constexpr std::size_t kExcerptHead = 16;
constexpr std::size_t kExcerptTail = 4;

constexpr unsigned kIndentStep = 4;
constexpr unsigned kDeepestIndent = 16;  // deeper lines are not indented further

void appendEscaped(std::string& out, std::string_view bytes) {
    if (bytes == "\n")
        out += "\\n";
    else if (bytes == "\r")
        out += "\\r";
    else if (bytes == "\t")
        out += "\\t";
    else
        for (const char c : bytes) out += fmt::format("\\x{:02x}", static_cast<unsigned char>(c));
}

std::string escape(std::string_view text, std::string_view alsoEscaped) {
    std::string out;
    out.reserve(text.size());
    while (!text.empty()) {
        const std::size_t length = utf8SequenceLength(text);
        const std::string_view sequence = text.substr(0, std::max<std::size_t>(length, 1));
        if (length == 0 || isControlCharacter(sequence)) {
            appendEscaped(out, sequence);
        } else {
            if (alsoEscaped.find(sequence[0]) != std::string_view::npos) out += '\\';
            out += sequence;
        }
        text.remove_prefix(sequence.size());
    }
    return out;
}

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
        text += toHex(bytes.subspan(i, std::min<std::size_t>(4, bytes.size() - i)));
    }
    return text;
}

}  // namespace

std::string escapeForTerminal(std::string_view text) {
    return escape(text, {});
}

std::string quoteForPropertyList(std::string_view text) {
    const auto bare = [](char c) {
        return (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') ||
               std::string_view("._/$-").find(c) != std::string_view::npos;
    };
    if (!text.empty() && std::all_of(text.begin(), text.end(), bare)) return std::string(text);
    return '"' + escape(text, "\"\\") + '"';
}

std::string describe(ByteView bytes) {
    if (bytes.empty()) return "{length = 0, bytes = 0x}";
    if (bytes.size() <= kWholeExcerpt)
        return fmt::format("{{length = {}, bytes = 0x{}}}", bytes.size(), hexWords(bytes));
    return fmt::format("{{length = {}, bytes = 0x{} ... {}}}", bytes.size(),
                       hexWords(bytes.first(kExcerptHead)), hexWords(bytes.last(kExcerptTail)));
}

std::string describe(const Error& error) {
    std::string text = fmt::format("Error Domain={} Code={} \"{}\"", escapeForTerminal(error.domain()),
                                   error.code(), escape(error.localizedFailureReason(), "\"\\"));
    if (error.userInfo().empty()) return text;
    text += " UserInfo={";
    bool first = true;
    for (const auto& [key, value] : error.userInfo()) {
        if (!first) text += ", ";
        first = false;
        text += escapeForTerminal(key) + "=";
        // In braces, not in quotes: in a chain of errors, quotes would double the backslashes at every link.
        text += value.error() != nullptr ? "{" + describe(*value.error()) + "}" : describe(value);
    }
    return text + "}";
}

std::string describe(const Value& value) {
    if (value.string() != nullptr) return escapeForTerminal(*value.string());
    if (value.isNull()) return "<null>";
    if (value.date() != nullptr) return toString(*value.date());
    if (value.url() != nullptr) return Description<URL>::of(*value.url());
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
        std::string operator()(Date date) const { return quoteForPropertyList(toString(date)); }
        std::string operator()(const std::shared_ptr<const Data>& data) const {
            return foundation::describe(ByteView(*data));
        }
        std::string operator()(const std::shared_ptr<const URL>& url) const {
            return quoteForPropertyList(url->absoluteString());
        }
        std::string operator()(const std::shared_ptr<const Error>& error) const {
            return quoteForPropertyList(foundation::describe(*error));
        }
        std::string operator()(const std::shared_ptr<const Array>& array) const {
            return foundation::describe(*array, indent);
        }
        std::string operator()(const std::shared_ptr<const Dictionary>& dictionary) const {
            return foundation::describe(*dictionary, indent);
        }
    };
    return std::visit(Visitor{indent}, content_);
}

std::string Description<Value>::of(const Value& value) {
    return describe(value);
}
std::string Description<Array>::of(const Array& array) {
    return describe(array);
}
std::string Description<Dictionary>::of(const Dictionary& dictionary) {
    return describe(dictionary);
}

}  // namespace pinwell::foundation
