// Texts made of objects: the output of "%@", and printf-style formats, checked against their arguments when
// compiling.
//
//   format("Found %lu blobs in %@", count, url)
//
// Conversions: %@ (any Describable), %d %i (integers of at most 32 bits, printed as signed), %u %x %X %o (the
// same, as unsigned), the l, ll, z, t and j lengths (64-bit integers), hh (one byte), %c (one character), %s
// (text; control characters escaped), %%. Flags, width and precision (up to 99) as in printf, but no '*'.
// A format that does not fit its arguments does not compile.
//
// "%@" prints one textual description for every platform object:
//
//   nil                (null); a JSON null <null>
//   text               itself; control characters and bytes outside UTF-8 as escapes, so that no text from
//                      a file or a server can control the terminal
//   number             decimal; booleans 1 and 0
//   byte buffer        {length = 20, bytes = 0x00010203 04050607 ... 10111213}
//   date               2026-11-20 19:55:00 +0000
//   file URL           file:///a%20b
//   error              Error Domain=D Code=N "text" UserInfo={...}
//   array, dictionary  the old property-list style, keys sorted; texts inside are quoted unless single words
//
// A type of another service becomes printable by specialising Description beside its declaration.
#pragma once

#include <array>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>

#include "base/bytes.h"
#include "base/error.h"
#include "base/text.h"
#include "values/date.h"
#include "values/url.h"
#include "values/value.h"

namespace pinwell::values {

/// `Description<T>::of(const T&)` returns the text; undefined for a type without a description.
template <class T>
struct Description;

inline constexpr std::string_view kNilDescription = "(null)";

/// The text as a property-list token: bare if it consists only of letters, digits and "._/$-", otherwise
/// quoted.
std::string quoteForPropertyList(std::string_view text);

std::string describe(base::ByteView bytes);
std::string describe(Date date);
std::string describe(const URL& url);
std::string describe(const base::Error& error);
std::string describe(const Value& value);
std::string describe(const Array& array, unsigned indent = 0);
std::string describe(const Dictionary& dictionary, unsigned indent = 0);

template <>
struct Description<std::nullptr_t> {
    static std::string of(std::nullptr_t) { return std::string(kNilDescription); }
};
template <>
struct Description<std::string> {
    static std::string of(const std::string& text) { return base::escapeForTerminal(text); }
};
template <>
struct Description<std::string_view> {
    static std::string of(std::string_view text) { return base::escapeForTerminal(text); }
};
template <>
struct Description<char*> {
    static std::string of(const char* text) {
        return text == nullptr ? std::string(kNilDescription) : base::escapeForTerminal(text);
    }
};
template <>
struct Description<const char*> {
    static std::string of(const char* text) {
        return text == nullptr ? std::string(kNilDescription) : base::escapeForTerminal(text);
    }
};
template <>
struct Description<base::Data> {
    static std::string of(const base::Data& data) { return describe(base::ByteView(data)); }
};
template <>
struct Description<base::ByteView> {
    static std::string of(base::ByteView bytes) { return describe(bytes); }
};
template <>
struct Description<Date> {
    static std::string of(Date date) { return describe(date); }
};
template <>
struct Description<URL> {
    static std::string of(const URL& url) { return describe(url); }
};
template <>
struct Description<base::Error> {
    static std::string of(const base::Error& error) { return describe(error); }
};
template <>
struct Description<Value> {
    static std::string of(const Value& value) { return describe(value); }
};
template <>
struct Description<Array> {
    static std::string of(const Array& array) { return describe(array); }
};
template <>
struct Description<Dictionary> {
    static std::string of(const Dictionary& dictionary) { return describe(dictionary); }
};

template <class T>
struct Description<std::optional<T>> {
    static std::string of(const std::optional<T>& object) {
        return object ? Description<T>::of(*object) : std::string(kNilDescription);
    }
};
template <class T>
struct Description<std::shared_ptr<T>> {
    static std::string of(const std::shared_ptr<T>& object) {
        return object ? Description<std::remove_const_t<T>>::of(*object) : std::string(kNilDescription);
    }
};

template <class T>
concept Describable = requires(const T& object) {
    { Description<T>::of(object) } -> std::convertible_to<std::string>;
};

namespace format_detail {

enum class ArgumentKind { object, int8, int32, int64, text };

/// One conversion of a format: from '%' to its letter.
struct Conversion {
    std::size_t end = 0;  // index after the letter
    char letter = '\0';
    ArgumentKind wants = ArgumentKind::object;
};

struct MalformedFormat {};

/// Largest width and precision.
inline constexpr std::size_t kMaximumFieldWidth = 99;

constexpr bool isOneOf(char c, std::string_view set) {
    return set.find(c) != std::string_view::npos;
}

/// Reads the conversion that begins at format[start] == '%'. Throws MalformedFormat; in a constant expression
/// that stops the compiler.
constexpr Conversion scanConversion(std::string_view format, std::size_t start) {
    std::size_t at = start + 1;
    const auto peek = [&] { return at < format.size() ? format[at] : '\0'; };
    const auto number = [&] {
        std::size_t value = 0;
        for (; peek() >= '0' && peek() <= '9'; ++at) {
            value = value * 10 + static_cast<std::size_t>(peek() - '0');
            if (value > kMaximumFieldWidth) throw MalformedFormat{};
        }
    };
    if (peek() == '%') return {at + 1, '%', ArgumentKind::object};
    while (peek() != '\0' && isOneOf(peek(), "-+ #0")) ++at;
    number();
    if (peek() == '.') {
        ++at;
        number();
    }
    const std::size_t lengthStart = at;
    ArgumentKind integer = ArgumentKind::int32;
    if (format.substr(at).starts_with("hh")) {
        integer = ArgumentKind::int8;
        at += 2;
    } else if (format.substr(at).starts_with("ll")) {
        integer = ArgumentKind::int64;
        at += 2;
    } else if (peek() != '\0' && isOneOf(peek(), "lztj")) {
        integer = ArgumentKind::int64;
        at += 1;
    }
    const char letter = peek();
    const bool hasLength = at > lengthStart;
    Conversion conversion{at + 1, letter, integer};
    switch (letter) {
        case 'd':
        case 'i':
        case 'u':
        case 'x':
        case 'X':
        case 'o':
            break;
        case 'c':
            conversion.wants = ArgumentKind::int8;
            break;
        case 's':
            conversion.wants = ArgumentKind::text;
            break;
        case '@':
            conversion.wants = ArgumentKind::object;
            break;
        default:
            throw MalformedFormat{};
    }
    if (hasLength && isOneOf(letter, "cs@")) throw MalformedFormat{};
    return conversion;
}

template <class T>
constexpr bool fits(ArgumentKind wants) {
    using U = std::decay_t<const T>;
    switch (wants) {
        case ArgumentKind::object:
            return Describable<U>;
        case ArgumentKind::int8:
            return std::is_integral_v<U> && sizeof(U) == 1;
        case ArgumentKind::int32:
            return std::is_integral_v<U> && sizeof(U) <= 4;
        case ArgumentKind::int64:
            return std::is_integral_v<U> && sizeof(U) == 8;
        case ArgumentKind::text:
            return std::is_convertible_v<const U&, std::string_view>;
    }
    return false;
}

/// An argument for the formatter: an integer, or the text of an object.
struct Argument {
    std::uint64_t integer = 0;  // sign-extended if the argument was signed
    std::string text;
};

template <class T>
Argument makeArgument(const T& value) {
    using U = std::decay_t<const T>;
    if constexpr (std::is_integral_v<U>) {
        return {static_cast<std::uint64_t>(value), {}};
    } else if constexpr (Describable<U>) {
        return {0, Description<U>::of(value)};
    } else {
        static_assert(std::is_convertible_v<const U&, std::string_view>);
        return {0, base::escapeForTerminal(std::string_view(value))};
    }
}

std::string formatArguments(std::string_view format, std::span<const Argument> arguments);

}  // namespace format_detail

/// A format checked against `Args`. Made only from a string literal.
template <class... Args>
class FormatString {
  public:
    template <std::size_t N>
    consteval FormatString(const char (&literal)[N]) : text_(literal, N - 1) {  // NOLINT: implicit by design
        std::size_t next = 0;
        for (std::size_t at = 0; at < text_.size();) {
            if (text_[at] != '%') {
                ++at;
                continue;
            }
            const auto conversion = format_detail::scanConversion(text_, at);
            if (conversion.letter != '%') {
                if (!argumentFits(next, conversion.wants)) throw format_detail::MalformedFormat{};
                ++next;
            }
            at = conversion.end;
        }
        if (next != sizeof...(Args)) throw format_detail::MalformedFormat{};
    }

    constexpr std::string_view text() const noexcept { return text_; }

  private:
    static consteval bool argumentFits(std::size_t index,
                                       [[maybe_unused]] format_detail::ArgumentKind wants) {
        const std::array<bool, sizeof...(Args) + 1> fitting{format_detail::fits<Args>(wants)..., false};
        return index < sizeof...(Args) && fitting[index];
    }

    std::string_view text_;
};

namespace format_detail {

/// The type of `format`.
struct FormatFunction {
    template <class... Args>
    std::string operator()(FormatString<std::type_identity_t<Args>...> format, const Args&... args) const {
        const std::array<Argument, sizeof...(Args) + 1> arguments{makeArgument(args)..., Argument{}};
        return formatArguments(format.text(), std::span(arguments).first(sizeof...(Args)));
    }
};

}  // namespace format_detail

/// Returns the formatted text. It is an object, not a function: an unqualified call with an argument of the
/// standard library would also find the function `std::format`.
inline constexpr format_detail::FormatFunction format{};

}  // namespace pinwell::values
