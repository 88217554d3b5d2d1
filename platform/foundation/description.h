// The output of "%@": one textual description for every platform object.
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

#include <concepts>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>

#include "foundation/bytes.h"
#include "foundation/date.h"
#include "foundation/error.h"
#include "foundation/url.h"
#include "foundation/value_fwd.h"

namespace pinwell::foundation {

/// `Description<T>::of(const T&)` returns the text; undefined for a type without a description.
template <class T>
struct Description;

inline constexpr std::string_view kNilDescription = "(null)";

/// The text with control characters (C0, DEL, C1) and malformed UTF-8 replaced by backslash escapes.
std::string escapeForTerminal(std::string_view text);

/// The text as a property-list token: bare if it consists only of letters, digits and "._/$-", otherwise
/// quoted.
std::string quoteForPropertyList(std::string_view text);

std::string describe(ByteView bytes);
std::string describe(const Error& error);
std::string describe(const Value& value);
std::string describe(const Array& array, unsigned indent = 0);
std::string describe(const Dictionary& dictionary, unsigned indent = 0);

template <>
struct Description<std::nullptr_t> {
    static std::string of(std::nullptr_t) { return std::string(kNilDescription); }
};
template <>
struct Description<std::string> {
    static std::string of(const std::string& text) { return escapeForTerminal(text); }
};
template <>
struct Description<std::string_view> {
    static std::string of(std::string_view text) { return escapeForTerminal(text); }
};
template <>
struct Description<char*> {
    static std::string of(const char* text) {
        return text == nullptr ? std::string(kNilDescription) : escapeForTerminal(text);
    }
};
template <>
struct Description<const char*> {
    static std::string of(const char* text) {
        return text == nullptr ? std::string(kNilDescription) : escapeForTerminal(text);
    }
};
template <>
struct Description<Data> {
    static std::string of(const Data& data) { return describe(ByteView(data)); }
};
template <>
struct Description<ByteView> {
    static std::string of(ByteView bytes) { return describe(bytes); }
};
template <>
struct Description<Date> {
    static std::string of(Date date) { return toString(date); }
};
template <>
struct Description<URL> {
    static std::string of(const URL& url) { return escapeForTerminal(url.absoluteString()); }
};
template <>
struct Description<Error> {
    static std::string of(const Error& error) { return describe(error); }
};
template <>
struct Description<Value> {
    static std::string of(const Value& value);
};
template <>
struct Description<Array> {
    static std::string of(const Array& array);
};
template <>
struct Description<Dictionary> {
    static std::string of(const Dictionary& dictionary);
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

}  // namespace pinwell::foundation
