// Dynamically typed values of JSON, property lists, user defaults and resource properties.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

#include "base/bytes.h"
#include "base/error.h"
#include "values/date.h"
#include "values/url.h"

namespace pinwell::values {

class Value;

using Array = std::vector<Value>;
using Dictionary = std::map<std::string, Value, std::less<>>;

/// Thrown if a value's kind does not support an operation (an element of a string, for example).
class ValueTypeError : public std::runtime_error {
  public:
    using std::runtime_error::runtime_error;
};

/// Nil, a JSON null, or one immutable value. Containers are shared, never copied.
///
/// The subscripts follow the platform's objects: a subscript of nil is nil, and so is a missing key of a
/// dictionary. A subscript that the kind does not support is an error (ValueTypeError; std::out_of_range for
/// an index past the end).
class Value {
  public:
    struct Null {
        bool operator==(const Null&) const = default;
    };

    Value() = default;
    Value(std::nullptr_t) {}
    Value(Null) : content_(Null{}) {}
    Value(bool value) : content_(value) {}
    Value(std::int64_t value) : content_(value) {}
    Value(std::uint64_t value) : content_(value) {}
    Value(int value) : content_(std::int64_t{value}) {}
    Value(unsigned value) : content_(std::uint64_t{value}) {}
    Value(double value) : content_(value) {}
    Value(std::string value) : content_(std::move(value)) {}
    Value(std::string_view value) : content_(std::string(value)) {}
    Value(const char* value) : content_(std::string(value)) {}
    Value(base::Data value) : content_(std::make_shared<const base::Data>(std::move(value))) {}
    Value(Date value) : content_(value) {}
    Value(URL value) : content_(std::make_shared<const URL>(std::move(value))) {}
    Value(base::Error value);
    Value(Array value);
    Value(Dictionary value);
    template <class T>
    Value(const T*) = delete;  // a pointer would silently become true

    bool isNil() const noexcept { return std::holds_alternative<std::monostate>(content_); }
    bool isNull() const noexcept { return std::holds_alternative<Null>(content_); }
    bool isNumber() const noexcept;  // also for bool, as on the platform

    /// Null unless the value is of that kind.
    const std::string* string() const noexcept { return std::get_if<std::string>(&content_); }
    const base::Data* data() const noexcept;
    const Date* date() const noexcept { return std::get_if<Date>(&content_); }
    const URL* url() const noexcept;
    const base::Error* error() const noexcept;
    const Array* array() const noexcept;
    const Dictionary* dictionary() const noexcept;
    const bool* boolean() const noexcept { return std::get_if<bool>(&content_); }
    const std::int64_t* integer() const noexcept { return std::get_if<std::int64_t>(&content_); }
    const std::uint64_t* unsignedInteger() const noexcept { return std::get_if<std::uint64_t>(&content_); }
    const double* real() const noexcept { return std::get_if<double>(&content_); }

    /// The number as an unsigned word: negative integers wrap, fractions are cut, large values saturate; 0
    /// for anything except a number.
    std::uint64_t unsignedIntegerValue() const noexcept;

    /// Whether the number is not zero; false for anything except a number.
    bool boolValue() const noexcept;

    const Value& operator[](std::string_view key) const;
    const Value& operator[](std::size_t index) const;

    /// The description inside an array or dictionary (values::describe returns the description by
    /// itself).
    std::string describe(unsigned indent) const;

    bool operator==(const Value& other) const;

  private:
    std::variant<std::monostate, Null, bool, std::int64_t, std::uint64_t, double, std::string, Date,
                 std::shared_ptr<const base::Data>, std::shared_ptr<const URL>,
                 std::shared_ptr<const base::Error>, std::shared_ptr<const Array>,
                 std::shared_ptr<const Dictionary>>
        content_;
};

}  // namespace pinwell::values
