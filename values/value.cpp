#include "values/value.h"

#include <cmath>
#include <limits>

namespace pinwell::values {
namespace {

using base::Data;
using base::Error;

constinit const Value kNil;

template <class T, class Content>
const T* shared(const Content& content) noexcept {
    const auto* pointer = std::get_if<std::shared_ptr<const T>>(&content);
    return pointer == nullptr ? nullptr : pointer->get();
}

std::uint64_t saturatingWord(double value) noexcept {
    if (std::isnan(value)) return 0;
    if (value < 0) {
        if (value <= static_cast<double>(std::numeric_limits<std::int64_t>::min()))
            return std::uint64_t{1} << 63U;
        return static_cast<std::uint64_t>(static_cast<std::int64_t>(value));
    }
    if (value >= 18446744073709551616.0) return std::numeric_limits<std::uint64_t>::max();
    return static_cast<std::uint64_t>(value);
}

}  // namespace

Value::Value(Error value) : content_(std::make_shared<const Error>(std::move(value))) {}
Value::Value(Array value) : content_(std::make_shared<const Array>(std::move(value))) {}
Value::Value(Dictionary value) : content_(std::make_shared<const Dictionary>(std::move(value))) {}

bool Value::isNumber() const noexcept {
    return std::holds_alternative<bool>(content_) || std::holds_alternative<std::int64_t>(content_) ||
           std::holds_alternative<std::uint64_t>(content_) || std::holds_alternative<double>(content_);
}

const Data* Value::data() const noexcept {
    return shared<Data>(content_);
}
const URL* Value::url() const noexcept {
    return shared<URL>(content_);
}
const Error* Value::error() const noexcept {
    return shared<Error>(content_);
}
const Array* Value::array() const noexcept {
    return shared<Array>(content_);
}
const Dictionary* Value::dictionary() const noexcept {
    return shared<Dictionary>(content_);
}

std::uint64_t Value::unsignedIntegerValue() const noexcept {
    if (const auto* flag = std::get_if<bool>(&content_)) return *flag ? 1 : 0;
    if (const auto* number = std::get_if<std::int64_t>(&content_)) return static_cast<std::uint64_t>(*number);
    if (const auto* number = std::get_if<std::uint64_t>(&content_)) return *number;
    if (const auto* number = std::get_if<double>(&content_)) return saturatingWord(*number);
    return 0;
}

bool Value::boolValue() const noexcept {
    if (const auto* number = std::get_if<double>(&content_)) return *number != 0;
    return unsignedIntegerValue() != 0;
}

const Value& Value::operator[](std::string_view key) const {
    if (isNil()) return kNil;
    const Dictionary* entries = dictionary();
    if (entries == nullptr) throw ValueTypeError("asked for a key of a value that is not a dictionary");
    const auto found = entries->find(key);
    return found == entries->end() ? kNil : found->second;
}

const Value& Value::operator[](std::size_t index) const {
    if (isNil()) return kNil;
    const Array* elements = array();
    if (elements == nullptr) throw ValueTypeError("asked for an element of a value that is not an array");
    return elements->at(index);
}

bool Value::operator==(const Value& other) const {
    if (content_.index() != other.content_.index()) {
        // A number may have two representations: 1 and 1u are equal.
        const auto integral = [](const Value& value) {
            return std::holds_alternative<std::int64_t>(value.content_) ||
                   std::holds_alternative<std::uint64_t>(value.content_);
        };
        if (!integral(*this) || !integral(other)) return false;
        const auto* mine = std::get_if<std::int64_t>(&content_);
        const auto* theirs = std::get_if<std::int64_t>(&other.content_);
        const bool negative = (mine != nullptr && *mine < 0) || (theirs != nullptr && *theirs < 0);
        return !negative && unsignedIntegerValue() == other.unsignedIntegerValue();
    }
    if (const Data* mine = data()) return *mine == *other.data();
    if (const URL* mine = url()) return *mine == *other.url();
    if (const Error* mine = error()) return *mine == *other.error();
    if (const Array* mine = array()) return *mine == *other.array();
    if (const Dictionary* mine = dictionary()) return *mine == *other.dictionary();
    return content_ == other.content_;
}

}  // namespace pinwell::values
