#include "values/json.h"

#include <fmt/format.h>

#include <algorithm>
#include <cmath>
#include <nlohmann/json.hpp>
#include <optional>
#include <utility>

#include "base/text.h"

namespace pinwell::values {
namespace {

using base::Error;
using base::kDataErrorDomain;
using base::kUnrepresentableValue;
using base::Result;

using Library = nlohmann::json;

Error malformed(std::string text) {
    return {kDataErrorDomain, base::kMalformedDocument, std::move(text)};
}
Error excessive(std::string text) {
    return {kDataErrorDomain, base::kExcessiveDocument, std::move(text)};
}

// Receives the library's events and builds the value on its own stack. So a deep document needs heap in
// proportion to its length, and no call stack. Returning false ends the parse.
class Builder {
  public:
    explicit Builder(EqualKeys equalKeys) : equalKeys_(equalKeys) {}

    bool null() { return add(Value::Null{}); }
    bool boolean(bool flag) { return add(flag); }
    bool number_integer(std::int64_t number) { return add(number); }
    bool number_unsigned(std::uint64_t number) {
        // One kind for numbers that fit both kinds, so that equal numbers are the same value.
        return std::in_range<std::int64_t>(number) ? add(static_cast<std::int64_t>(number)) : add(number);
    }
    bool number_float(double number, const std::string&) { return add(number); }
    bool string(std::string& text) { return add(std::move(text)); }
    bool binary(Library::binary_t&) { return false; }  // never in text

    bool start_object(std::size_t) { return open(true); }
    bool key(std::string& name) {
        if (equalKeys_ == EqualKeys::refused && open_.back().members.contains(name)) {
            error_ = malformed(fmt::format("An object of the JSON document has the key \"{}\" twice.",
                                           base::escapeForTerminal(name)));
            return false;
        }
        open_.back().key = std::move(name);
        return true;
    }
    bool end_object() { return close(); }
    bool start_array(std::size_t) { return open(false); }
    bool end_array() { return close(); }

    bool parse_error(std::size_t position, const std::string&, const nlohmann::detail::exception&) {
        // The library's count includes the faulty byte.
        error_ = malformed(fmt::format("The JSON document is malformed at byte {}.",
                                       std::max<std::size_t>(position, 1) - 1));
        return false;
    }

    Result<Value> finish() && {
        if (error_) return std::move(*error_);
        if (root_.array() == nullptr && root_.dictionary() == nullptr)
            return malformed("The JSON document is neither an object nor an array, at byte 0.");
        return std::move(root_);
    }

  private:
    struct Container {
        bool isObject = false;
        std::string key;  // of the next member
        Dictionary members;
        Array elements;
    };

    bool open(bool isObject) {
        if (open_.size() == kMaximumJSONDepth) {
            error_ = excessive(
                fmt::format("The JSON document is nested deeper than {} levels.", kMaximumJSONDepth));
            return false;
        }
        open_.push_back({isObject, {}, {}, {}});
        return true;
    }

    bool close() {
        Container container = std::move(open_.back());
        open_.pop_back();
        return container.isObject ? add(std::move(container.members)) : add(std::move(container.elements));
    }

    bool add(Value value) {
        if (++count_ > kMaximumJSONValues) {
            error_ =
                excessive(fmt::format("The JSON document holds more than {} values.", kMaximumJSONValues));
            return false;
        }
        if (open_.empty()) {
            root_ = std::move(value);
        } else if (Container& parent = open_.back(); parent.isObject) {
            parent.members.insert_or_assign(std::move(parent.key), std::move(value));
        } else {
            parent.elements.push_back(std::move(value));
        }
        return true;
    }

    const EqualKeys equalKeys_;
    std::vector<Container> open_;
    std::size_t count_ = 0;
    Value root_;
    std::optional<Error> error_;
};

struct NotInJSON {
    std::string_view what;
};

Library toLibrary(const Value& value, unsigned depth);

Library containerToLibrary(const Value& value, unsigned depth) {
    if (depth == kMaximumJSONDepth) throw NotInJSON{"values nested this deep"};
    if (const Dictionary* members = value.dictionary()) {
        Library object = Library::object();
        for (const auto& [key, member] : *members) object[key] = toLibrary(member, depth + 1);
        return object;
    }
    Library array = Library::array();
    for (const Value& element : *value.array()) array.push_back(toLibrary(element, depth + 1));
    return array;
}

Library toLibrary(const Value& value, unsigned depth) {
    if (value.isNull()) return nullptr;
    if (const bool* flag = value.boolean()) return *flag;
    if (const auto* number = value.integer()) return *number;
    if (const auto* number = value.unsignedInteger()) return *number;
    if (const double* number = value.real()) {
        if (!std::isfinite(*number)) throw NotInJSON{"a number that is not finite"};
        return *number;
    }
    if (const std::string* text = value.string()) return *text;
    if (value.array() != nullptr || value.dictionary() != nullptr) return containerToLibrary(value, depth);
    throw NotInJSON{"a value of this kind"};
}

}  // namespace

Result<Value> parseJSON(base::ByteView document, EqualKeys equalKeys) {
    if (document.size() > kMaximumJSONSize)
        return excessive(fmt::format("The JSON document is longer than {} bytes.", kMaximumJSONSize));
    // The library treats a zero byte as the end of the text, and would not read the rest.
    if (const auto zero = std::find(document.begin(), document.end(), std::byte{0}); zero != document.end())
        return malformed(fmt::format("The JSON document is malformed at byte {}.", zero - document.begin()));
    Builder builder(equalKeys);
    Library::sax_parse(document.begin(), document.end(), &builder);
    return std::move(builder).finish();
}

Result<base::Data> serializeJSON(const Value& value) {
    if (value.array() == nullptr && value.dictionary() == nullptr)
        return Error(kDataErrorDomain, kUnrepresentableValue,
                     "The top level of JSON must be an object or an array.");
    try {
        return base::toData(std::string_view(toLibrary(value, 0).dump()));
    } catch (const NotInJSON& reason) {
        return Error(kDataErrorDomain, kUnrepresentableValue,
                     fmt::format("JSON cannot hold {}.", reason.what));
    } catch (const Library::type_error&) {
        return Error(kDataErrorDomain, kUnrepresentableValue, "JSON cannot hold text that is not UTF-8.");
    }
}

}  // namespace pinwell::values
