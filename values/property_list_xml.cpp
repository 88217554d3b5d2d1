#include "values/property_list.h"

#include <fmt/format.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <chrono>
#include <cmath>
#include <optional>
#include <string_view>
#include <utility>
#include <vector>

#include "base/text.h"
#include "values/xml_parser.h"

namespace pinwell::values {
namespace {

using base::ByteView;
using base::Data;

constexpr std::string_view kXMLWhiteSpace = " \t\r\n";

enum class ElementKind { list, dictionary, array, key, string, integer, real, yes, no, date, data };

constexpr std::array<std::pair<std::string_view, ElementKind>, 11> kElements{
    {{"plist", ElementKind::list},
     {"dict", ElementKind::dictionary},
     {"array", ElementKind::array},
     {"key", ElementKind::key},
     {"string", ElementKind::string},
     {"integer", ElementKind::integer},
     {"real", ElementKind::real},
     {"true", ElementKind::yes},
     {"false", ElementKind::no},
     {"date", ElementKind::date},
     {"data", ElementKind::data}}};

bool isContainer(ElementKind kind) {
    return kind == ElementKind::list || kind == ElementKind::dictionary || kind == ElementKind::array;
}

bool isXMLWhiteSpace(std::string_view text) {
    return text.find_first_not_of(kXMLWhiteSpace) == std::string_view::npos;
}

std::string_view trimmed(std::string_view text) {
    text.remove_prefix(std::min(text.find_first_not_of(kXMLWhiteSpace), text.size()));
    return text.substr(0, text.find_last_not_of(kXMLWhiteSpace) + 1);
}

// The number in the whole text, or `nullopt`.
template <class Number, class... Options>
std::optional<Number> numberOf(std::string_view text, Options... options) {
    Number number{};
    const auto [end, fault] = std::from_chars(text.data(), text.data() + text.size(), number, options...);
    if (fault != std::errc() || end != text.data() + text.size()) return std::nullopt;
    return number;
}

// Decimal, or hexadecimal after "0x"; with a sign.
std::optional<Value> integerOf(std::string_view text) {
    constexpr int kDecimal = 10;
    constexpr int kHexadecimal = 16;
    const bool isNegative = text.starts_with('-');
    if (isNegative || text.starts_with('+')) text.remove_prefix(1);
    const bool isHexadecimal = text.starts_with("0x") || text.starts_with("0X");
    if (isHexadecimal) text.remove_prefix(2);
    const auto magnitude = numberOf<std::uint64_t>(text, isHexadecimal ? kHexadecimal : kDecimal);
    if (!magnitude) return std::nullopt;
    if (!isNegative)
        return std::in_range<std::int64_t>(*magnitude) ? Value(static_cast<std::int64_t>(*magnitude))
                                                       : Value(*magnitude);
    if (*magnitude > std::uint64_t{1} << 63U) return std::nullopt;
    return Value(static_cast<std::int64_t>(0 - *magnitude));
}

std::optional<Value> realOf(std::string_view text) {
    if (text.starts_with('+')) {
        text.remove_prefix(1);
        if (text.starts_with('-')) return std::nullopt;
    }
    const auto number = numberOf<double>(text);
    return number ? std::optional<Value>(*number) : std::nullopt;
}

// "2026-11-20T19:55:00Z", and no other form.
std::optional<Value> dateOf(std::string_view text) {
    constexpr std::string_view kForm = "0000-00-00T00:00:00Z";
    const bool isOfForm =
        std::equal(text.begin(), text.end(), kForm.begin(), kForm.end(),
                   [](char c, char form) { return form == '0' ? c >= '0' && c <= '9' : c == form; });
    if (!isOfForm) return std::nullopt;
    const auto number = [&](std::size_t at, std::size_t length) {
        return *numberOf<unsigned>(text.substr(at, length));
    };
    const std::chrono::year_month_day day{std::chrono::year(static_cast<int>(number(0, 4))),
                                          std::chrono::month(number(5, 2)), std::chrono::day(number(8, 2))};
    const unsigned hour = number(11, 2);
    const unsigned minute = number(14, 2);
    const unsigned second = number(17, 2);
    if (!day.ok() || hour > 23 || minute > 59 || second > 59) return std::nullopt;
    const auto time = std::chrono::sys_days(day) + std::chrono::hours(hour) + std::chrono::minutes(minute) +
                      std::chrono::seconds(second);
    return Date{std::chrono::duration_cast<std::chrono::seconds>(time.time_since_epoch()).count()};
}

std::optional<Value> dataOf(std::string text) {
    std::erase_if(text, [](char c) { return kXMLWhiteSpace.find(c) != std::string_view::npos; });
    auto bytes = base::decodeBase64(text);
    return bytes ? std::optional<Value>(*std::move(bytes)) : std::nullopt;
}

class XMLList final : public XMLEvents {
  public:
    Value read(ByteView document) try {
        parser_.feed(document);
        parser_.finish();
        if (!root_) refuse("no value");
        return *root_;
    } catch (const MalformedXML& fault) {
        refuse(fault.what(), fault.offset());
    }

  private:
    // An open element.
    struct Open {
        ElementKind kind;
        Array elements;
        Dictionary members;
        std::optional<std::string> key;  // of the next member
    };

    [[noreturn]] void refuse(std::string_view what) const { refuse(what, parser_.offset()); }

    [[noreturn]] static void refuse(std::string_view what, std::uint64_t offset) {
        throw property_list_detail::Refusal(
            base::kMalformedDocument,
            fmt::format("The property list is malformed at byte {}: {}.", offset, what));
    }
    [[noreturn]] static void refuseSize(const char* what) {
        throw property_list_detail::Refusal(base::kExcessiveDocument, what);
    }

    bool inLeaf() const { return !open_.empty() && !isContainer(open_.back().kind); }

    void begin(std::string_view name, const XMLAttributes&) override {
        const auto* const found = std::find_if(kElements.begin(), kElements.end(),
                                               [&](const auto& it) { return it.first == name; });
        if (found == kElements.end()) refuse("unknown element");
        const ElementKind kind = found->second;
        if ((kind == ElementKind::list) != open_.empty()) refuse("an element where it does not belong");
        if (inLeaf()) refuse("an element inside text");
        if (kind != ElementKind::list) mayBegin(kind);
        open_.push_back({kind, {}, {}, std::nullopt});
    }

    void mayBegin(ElementKind kind) {
        const Open& parent = open_.back();
        if (++values_ > kMaximumPropertyListValues) refuseSize("The property list holds too many values.");
        // Neither the document's own element nor the value itself counts as nesting.
        if (open_.size() - 1 > kMaximumPropertyListDepth)
            refuseSize("The property list is nested too deeply.");
        const bool wantsKey = parent.kind == ElementKind::dictionary && !parent.key;
        if ((kind == ElementKind::key) != wantsKey)
            refuse(wantsKey ? "a value without a key" : "a key out of place");
        if (parent.kind == ElementKind::list && root_) refuse("more than one value");
    }

    void text(std::string_view piece) override {
        if (inLeaf())
            text_ += piece;
        else if (!isXMLWhiteSpace(piece))
            refuse("text outside a value");
    }

    void end(std::string_view) override {
        Open element = std::move(open_.back());
        open_.pop_back();
        if (element.kind == ElementKind::list) return;
        std::string text = std::exchange(text_, {});
        if (element.kind == ElementKind::key) {
            open_.back().key = std::move(text);
            return;
        }
        if (element.key) refuse("a key without a value");
        add(isContainer(element.kind) ? containerOf(std::move(element))
                                      : leafOf(element.kind, std::move(text)));
    }

    static Value containerOf(Open element) {
        if (element.kind == ElementKind::array) return std::move(element.elements);
        return std::move(element.members);
    }

    Value leafOf(ElementKind kind, std::string text) const {
        std::optional<Value> value;
        switch (kind) {
            case ElementKind::string:
                return text;
            case ElementKind::integer:
                value = integerOf(trimmed(text));
                break;
            case ElementKind::real:
                value = realOf(trimmed(text));
                break;
            case ElementKind::date:
                value = dateOf(trimmed(text));
                break;
            case ElementKind::data:
                value = dataOf(std::move(text));
                break;
            default:
                if (isXMLWhiteSpace(text)) value = kind == ElementKind::yes;
                break;
        }
        if (!value) refuse("text that is no value of its kind");
        return *std::move(value);
    }

    void add(Value value) {
        Open& parent = open_.back();
        if (parent.kind == ElementKind::list)
            root_ = std::move(value);
        else if (parent.kind == ElementKind::array)
            parent.elements.push_back(std::move(value));
        else
            parent.members.insert_or_assign(*std::exchange(parent.key, std::nullopt), std::move(value));
    }

    XMLParser parser_{*this, XMLParser::DocumentType::withoutDeclarations};
    std::vector<Open> open_;
    std::string text_;  // of the open leaf
    std::optional<Value> root_;
    std::size_t values_ = 0;
};

struct NotInAPropertyList {
    std::string_view what;
};

// Writes one value on each line, indented by its depth.
class PropertyListWriter {
  public:
    std::string write(const Value& root) {
        text_ = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n";
        write(root, 0);
        return std::move(text_) + "</plist>\n";
    }

  private:
    void line(unsigned depth, const std::string& markup) {
        text_.append(depth, '\t').append(markup).append(1, '\n');
    }

    void write(const Value& value, unsigned depth) {
        if (value.array() != nullptr || value.dictionary() != nullptr) return writeContainer(value, depth);
        if (const bool* flag = value.boolean()) return line(depth, *flag ? "<true/>" : "<false/>");
        if (const auto* number = value.integer())
            return line(depth, fmt::format("<integer>{}</integer>", *number));
        if (const auto* number = value.unsignedInteger()) {
            if (!std::in_range<std::int64_t>(*number)) throw NotInAPropertyList{"an integer above 63 bits"};
            return line(depth, fmt::format("<integer>{}</integer>", *number));
        }
        if (const double* number = value.real()) {
            if (!std::isfinite(*number)) throw NotInAPropertyList{"a number that is not finite"};
            return line(depth, fmt::format("<real>{}</real>", *number));
        }
        if (const std::string* text = value.string())
            return line(depth, "<string>" + escaped(*text) + "</string>");
        if (const Data* data = value.data())
            return line(depth, "<data>" + base::encodeBase64(*data) + "</data>");
        throw NotInAPropertyList{"a value of this kind"};
    }

    void writeContainer(const Value& value, unsigned depth) {
        if (depth == kMaximumPropertyListDepth) throw NotInAPropertyList{"values nested this deep"};
        const bool isArray = value.array() != nullptr;
        line(depth, isArray ? "<array>" : "<dict>");
        if (isArray) {
            for (const Value& element : *value.array()) write(element, depth + 1);
        } else {
            for (const auto& [key, member] : *value.dictionary()) {
                line(depth + 1, "<key>" + escaped(key) + "</key>");
                write(member, depth + 1);
            }
        }
        line(depth, isArray ? "</array>" : "</dict>");
    }

    // XML cannot represent most control characters, not even escaped, nor U+FFFE and U+FFFF.
    static std::string escaped(std::string_view text) {
        if (!base::isUTF8(text) || text.find("\xEF\xBF\xBE") != std::string_view::npos ||
            text.find("\xEF\xBF\xBF") != std::string_view::npos)
            throw NotInAPropertyList{"text that is not UTF-8, or has no characters of XML"};
        std::string out;
        for (const char c : text) {
            if (static_cast<unsigned char>(c) < 0x20 && c != '\n' && c != '\t' && c != '\r')
                throw NotInAPropertyList{"text with control characters"};
            if (c == '&')
                out += "&amp;";
            else if (c == '<')
                out += "&lt;";
            else if (c == '>')
                out += "&gt;";
            else if (c == '\r')
                out += "&#13;";  // unescaped, it would be read as a line feed
            else
                out += c;
        }
        return out;
    }

    std::string text_;
};

}  // namespace

Value property_list_detail::readXML(ByteView document) {
    return XMLList().read(document);
}

base::Result<Data> serializePropertyList(const Value& value) {
    try {
        return base::toData(std::string_view(PropertyListWriter().write(value)));
    } catch (const NotInAPropertyList& reason) {
        return base::Error(base::kDataErrorDomain, base::kUnrepresentableValue,
                           fmt::format("A property list cannot hold {}.", reason.what));
    }
}

}  // namespace pinwell::values
