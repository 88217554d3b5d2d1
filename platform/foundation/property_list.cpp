#include "foundation/property_list.h"

#include <fmt/format.h>
#include <plist/plist.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <limits>
#include <memory>
#include <optional>

#include "foundation/handle.h"
#include "foundation/property_list_guard.h"
#include "foundation/utf8.h"

namespace pinwell::foundation {
namespace {

// The library's dates count from 2001-01-01.
constexpr std::int64_t kLibraryEpoch = 978307200;

constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";

struct FreeMemory {
    void operator()(void* memory) const { std::free(memory); }  // NOLINT: allocated by the C library's malloc
};
using Node = Handle<void, plist_free>;
using Iterator = std::unique_ptr<void, FreeMemory>;
using Text = std::unique_ptr<char, FreeMemory>;

Value fromNode(plist_t node);

Value fromArray(plist_t node) {
    plist_array_iter raw = nullptr;
    plist_array_new_iter(node, &raw);
    const Iterator iterator(raw);
    Array elements;
    plist_t child = nullptr;
    while (plist_array_next_item(node, iterator.get(), &child), child != nullptr)
        elements.push_back(fromNode(child));
    return elements;
}

Value fromDictionary(plist_t node) {
    plist_dict_iter raw = nullptr;
    plist_dict_new_iter(node, &raw);
    const Iterator iterator(raw);
    Dictionary members;
    while (true) {
        char* rawKey = nullptr;
        plist_t child = nullptr;
        plist_dict_next_item(node, iterator.get(), &rawKey, &child);
        const Text key(rawKey);
        if (child == nullptr) return members;
        if (key != nullptr) members.insert_or_assign(key.get(), fromNode(child));
    }
}

// Recurses no deeper than the limit that the document was held against.
Value fromNode(plist_t node) {
    std::uint64_t length = 0;
    switch (plist_get_node_type(node)) {
        case PLIST_BOOLEAN: {
            std::uint8_t flag = 0;
            plist_get_bool_val(node, &flag);
            return flag != 0;
        }
        case PLIST_UINT: {
            std::uint64_t number = 0;
            plist_get_uint_val(node, &number);
            return static_cast<std::int64_t>(number);
        }
        case PLIST_UID: {
            std::uint64_t number = 0;
            plist_get_uid_val(node, &number);
            return number;
        }
        case PLIST_REAL: {
            double number = 0;
            plist_get_real_val(node, &number);
            return number;
        }
        case PLIST_DATE: {
            std::int32_t seconds = 0;
            std::int32_t microseconds = 0;
            plist_get_date_val(node, &seconds, &microseconds);
            return Date{kLibraryEpoch + seconds};
        }
        case PLIST_STRING: {
            const char* text = plist_get_string_ptr(node, &length);
            return text == nullptr ? std::string() : std::string(text, static_cast<std::size_t>(length));
        }
        case PLIST_DATA: {
            const char* bytes = plist_get_data_ptr(node, &length);
            return bytes == nullptr ? Data()
                                    : toData(std::string_view(bytes, static_cast<std::size_t>(length)));
        }
        case PLIST_ARRAY:
            return fromArray(node);
        case PLIST_DICT:
            return fromDictionary(node);
        default:
            return {};
    }
}

struct NotInAPropertyList {
    std::string_view what;
};

// XML has no way to write most control characters, not even escaped.
const char* xmlText(const std::string& text) {
    const bool isPlain = std::none_of(text.begin(), text.end(), [](char c) {
        return static_cast<unsigned char>(c) < 0x20 && c != '\n' && c != '\t' && c != '\r';
    });
    if (!isPlain || !isUTF8(text))
        throw NotInAPropertyList{"text with control characters, or that is not UTF-8"};
    return text.c_str();
}

Node toNode(const Value& value, unsigned depth);

Node containerToNode(const Value& value, unsigned depth) {
    if (depth == kMaximumPropertyListDepth) throw NotInAPropertyList{"values nested this deep"};
    if (const Array* elements = value.array()) {
        Node array(plist_new_array());
        for (const Value& element : *elements)
            plist_array_append_item(array.get(), toNode(element, depth + 1).release());
        return array;
    }
    Node dictionary(plist_new_dict());
    for (const auto& [key, member] : *value.dictionary()) {
        const char* name = xmlText(key);  // may throw, and so comes before ownership is given up
        plist_dict_set_item(dictionary.get(), name, toNode(member, depth + 1).release());
    }
    return dictionary;
}

Node toNode(const Value& value, unsigned depth) {
    if (const bool* flag = value.boolean()) return Node(plist_new_bool(*flag ? 1 : 0));
    if (const auto* number = value.integer())
        return Node(plist_new_uint(static_cast<std::uint64_t>(*number)));
    if (const auto* number = value.unsignedInteger()) {
        if (!std::in_range<std::int64_t>(*number)) throw NotInAPropertyList{"an integer above 63 bits"};
        return Node(plist_new_uint(*number));
    }
    if (const double* number = value.real()) {
        if (!std::isfinite(*number)) throw NotInAPropertyList{"a number that is not finite"};
        return Node(plist_new_real(*number));
    }
    if (const std::string* text = value.string()) return Node(plist_new_string(xmlText(*text)));
    if (const Data* data = value.data()) {
        const std::string bytes = toString(*data);
        return Node(plist_new_data(bytes.data(), bytes.size()));
    }
    if (value.array() != nullptr || value.dictionary() != nullptr) return containerToNode(value, depth);
    throw NotInAPropertyList{"a value of this kind"};
}

}  // namespace

Result<Value> parsePropertyList(ByteView document) {
    if (document.size() > kMaximumPropertyListSize)
        return Error(kDataErrorDomain, kExcessiveDocument,
                     fmt::format("The property list is longer than {} bytes.", kMaximumPropertyListSize));
    // The library does not know the byte-order mark of UTF-8.
    const bool isMarked =
        toString(document.first(std::min(document.size(), kByteOrderMark.size()))) == kByteOrderMark;
    if (isMarked) document = document.subspan(kByteOrderMark.size());
    const std::string text = toString(document);
    const bool isBinary = !isMarked && text.starts_with(kBinaryPropertyListMagic);
    if (auto refusal = isBinary ? refuseBinaryPropertyList(document) : refuseXMLPropertyList(document))
        return std::move(*refusal);
    plist_t raw = nullptr;
    const auto length = static_cast<std::uint32_t>(text.size());
    if (isBinary)
        plist_from_bin(text.data(), length, &raw);
    else
        plist_from_xml(text.data(), length, &raw);
    const Node root(raw);
    if (root == nullptr)
        return Error(kDataErrorDomain, kMalformedDocument, "The property list is malformed.");
    return fromNode(root.get());
}

Result<Data> serializePropertyList(const Value& value) {
    try {
        const Node root = toNode(value, 0);
        char* raw = nullptr;
        std::uint32_t length = 0;
        plist_to_xml(root.get(), &raw, &length);
        const Text xml(raw);
        if (xml == nullptr) throw NotInAPropertyList{"this value"};
        return toData(std::string_view(xml.get(), length));
    } catch (const NotInAPropertyList& reason) {
        return Error(kDataErrorDomain, kUnrepresentableValue,
                     fmt::format("A property list cannot hold {}.", reason.what));
    }
}

}  // namespace pinwell::foundation
