#include "foundation/property_list.h"

#include <fmt/format.h>

#include <cmath>
#include <optional>
#include <utility>

#include "foundation/base64.h"
#include "foundation/byte_reader.h"
#include "foundation/bytes.h"
#include "foundation/property_list_reader.h"
#include "foundation/utf8.h"
#include "foundation/value.h"

namespace pinwell::foundation {
namespace {

bool isBinaryList(ByteView document) {
    const std::size_t length = kBinaryPropertyListMagic.size();
    return document.size() >= length && toString(document.first(length)) == kBinaryPropertyListMagic;
}

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
        if (const Data* data = value.data()) return line(depth, "<data>" + encodeBase64(*data) + "</data>");
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
        if (!isUTF8(text) || text.find("\xEF\xBF\xBE") != std::string_view::npos ||
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

Result<Value> parsePropertyList(ByteView document) {
    if (document.size() > kMaximumPropertyListSize)
        return Error(kDataErrorDomain, kExcessiveDocument,
                     fmt::format("The property list is longer than {} bytes.", kMaximumPropertyListSize));
    try {
        return isBinaryList(document) ? readBinaryPropertyList(document) : readXMLPropertyList(document);
    } catch (const PropertyListRefusal& refusal) {
        return Error(kDataErrorDomain, refusal.code(), refusal.what());
    } catch (const ShortRead& shortage) {
        return Error(kDataErrorDomain, kMalformedDocument,
                     fmt::format("The binary property list is cut short: {}.", shortage.what()));
    }
}

Result<Data> serializePropertyList(const Value& value) {
    try {
        return toData(std::string_view(PropertyListWriter().write(value)));
    } catch (const NotInAPropertyList& reason) {
        return Error(kDataErrorDomain, kUnrepresentableValue,
                     fmt::format("A property list cannot hold {}.", reason.what));
    }
}

}  // namespace pinwell::foundation
