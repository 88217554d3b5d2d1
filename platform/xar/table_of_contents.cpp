#include "xar/table_of_contents.h"

#include <libxml/SAX2.h>
#include <libxml/dict.h>
#include <libxml/parser.h>

#include <algorithm>
#include <new>
#include <string_view>
#include <utility>

namespace pinwell::xar {
namespace {

using foundation::ByteView;

// The parser's characters are unsigned char; these two functions are all that stands between its and ours.
std::string_view textOf(const xmlChar* begin, const xmlChar* end) {
    return {reinterpret_cast<const char*>(begin), static_cast<std::size_t>(end - begin)};
}
std::string_view textOf(const xmlChar* text) {
    return textOf(text, text + xmlStrlen(text));
}

// One attribute as the parser lays it out: five pointers.
struct Attribute {
    const xmlChar* name;
    const xmlChar* prefix;
    const xmlChar* space;
    const xmlChar* valueBegin;
    const xmlChar* valueEnd;
};
constexpr std::size_t kPointersPerAttribute = 5;

std::optional<std::string> styleAmong(std::span<const xmlChar* const> attributes) {
    for (; attributes.size() >= kPointersPerAttribute;
         attributes = attributes.subspan(kPointersPerAttribute)) {
        const Attribute attribute{attributes[0], attributes[1], attributes[2], attributes[3], attributes[4]};
        if (attribute.prefix == nullptr && textOf(attribute.name) == "style")
            return std::string(textOf(attribute.valueBegin, attribute.valueEnd));
    }
    return std::nullopt;
}

bool isBlank(std::string_view text) {
    return text.find_first_not_of(" \t\r\n") == std::string_view::npos;
}

bool decidesTheChecksum(std::string_view path) {
    return path == "checksum" || path == "checksum/offset" || path == "checksum/size";
}

}  // namespace

class TableOfContentsReader::Parser {
  public:
    Parser() {
        xmlSAXHandler handler{};
        handler.initialized = XML_SAX2_MAGIC;
        handler.startElementNs = [](void* parser, const xmlChar* name, const xmlChar*, const xmlChar*, int,
                                    const xmlChar**, int count, int, const xmlChar** attributes) {
            const auto pointers = static_cast<std::size_t>(count) * kPointersPerAttribute;
            guarded(parser, [&](Parser& self) { self.begin(textOf(name), {attributes, pointers}); });
        };
        handler.endElementNs = [](void* parser, const xmlChar*, const xmlChar*, const xmlChar*) {
            guarded(parser, [](Parser& self) { self.end(); });
        };
        handler.characters = [](void* parser, const xmlChar* text, int length) {
            guarded(parser, [&](Parser& self) { self.characters(textOf(text, text + length)); });
        };
        handler.cdataBlock = handler.characters;
        // Without handlers for errors there is nothing that prints any.
        context_.reset(xmlCreatePushParserCtxt(&handler, this, nullptr, 0, nullptr));
        if (!context_) throw std::bad_alloc();
        // NOENT has "&amp;" come out as a character; no other entity can be declared without a document type.
        // IGNORE_ENC holds the document to the encoding in which the guard has read it.
        xmlCtxtUseOptions(context_.get(), XML_PARSE_NONET | XML_PARSE_NOENT | XML_PARSE_IGNORE_ENC |
                                              XML_PARSE_NOERROR | XML_PARSE_NOWARNING);
        // Its own limit leaves room for a million names, which it looks up in ever longer lists.
        xmlDictSetLimit(context_->dict, kMaximumNames);
    }

    bool feed(ByteView bytes) {
        const auto* const text = reinterpret_cast<const char*>(bytes.data());
        xmlParseChunk(context_.get(), text, static_cast<int>(bytes.size()), 0);
        return isWellFormed() && !refused_;
    }

    std::optional<TableOfContents> finish() {
        xmlParseChunk(context_.get(), nullptr, 0, 1);
        if (!isWellFormed() || refused_ || !found_ || depth_ != 0) return std::nullopt;
        return std::move(table_);
    }

  private:
    struct Free {
        void operator()(xmlParserCtxt* context) const noexcept {
            xmlFreeDoc(context->myDoc);
            xmlFreeParserCtxt(context);
        }
    };

    // An open element that is a property.
    struct Property {
        std::size_t parentPath;  // length of the path it was opened in
        bool counts;             // it is the first one of its path
        std::string text;        // so far
    };

    static constexpr std::size_t kChildOfTable = 3;

    // Not the status that the parser returns, to which an undeclared name-space prefix is an error. And a
    // parser that ran out of memory or names has stopped, without a word on what it has not seen.
    bool isWellFormed() const { return context_->wellFormed != 0 && context_->disableSAX == 0; }

    // Nothing may be thrown through the parser, which is C.
    template <class Action>
    static void guarded(void* parser, Action action) noexcept {
        Parser& self = *static_cast<Parser*>(parser);
        if (self.refused_) return;
        try {
            action(self);
        } catch (const std::exception&) {
            self.refuse();
        }
    }

    void refuse() noexcept {
        refused_ = true;
        xmlStopParser(context_.get());
    }

    bool passingOver() const { return passedOver_ != 0; }

    void begin(std::string_view name, std::span<const xmlChar* const> attributes) {
        ++depth_;
        if (depth_ > kMaximumDepth || ++elements_ > kMaximumElements) return refuse();
        if (passingOver()) return;
        if (depth_ == 1) {
            if (name != "xar") refuse();
        } else if (depth_ + 1 == kChildOfTable) {
            if (name != "toc") return passOver();
            if (std::exchange(found_, true)) refuse();
        } else if (depth_ == kChildOfTable && isSignature(name)) {
            if (table_.signatures.size() == kMaximumSignatures) return refuse();
            table_.signatures.push_back(styleAmong(attributes));
            passOver();
        } else if (depth_ == kChildOfTable && name == "file") {
            passOver();
        } else {
            beginProperty(name, attributes);
        }
    }

    void passOver() { passedOver_ = depth_; }

    // The second came later, for what older readers should not stumble over: they take it for a property.
    static bool isSignature(std::string_view name) { return name == "signature" || name == "x-signature"; }

    void beginProperty(std::string_view name, std::span<const xmlChar* const> attributes) {
        if (name.size() + 1 > kMaximumPath - path_.size()) return refuse();
        const std::size_t parentPath = path_.size();
        if (!path_.empty()) path_ += '/';
        path_ += name;
        const bool isFirst = table_.properties.emplace(path_, std::nullopt).second;
        if (table_.properties.size() > kMaximumProperties) return refuse();
        if (!isFirst && decidesTheChecksum(path_)) return refuse();
        if (path_ == "checksum") table_.checksumStyle = styleAmong(attributes);
        open_.push_back({parentPath, isFirst, {}});
    }

    void end() {
        if (passedOver_ == depth_) {
            passedOver_ = 0;
        } else if (!passingOver() && !open_.empty()) {
            Property& property = open_.back();
            if (property.counts && !isBlank(property.text))
                table_.properties.find(path_)->second = std::move(property.text);
            path_.resize(property.parentPath);
            open_.pop_back();
        }
        --depth_;
    }

    void characters(std::string_view text) {
        if (!passingOver() && !open_.empty()) open_.back().text += text;
    }

    std::unique_ptr<xmlParserCtxt, Free> context_;
    TableOfContents table_;
    std::vector<Property> open_;
    std::string path_;
    std::size_t depth_ = 0;
    std::size_t passedOver_ = 0;  // the depth of the element that is passed over; 0 for none
    std::size_t elements_ = 0;
    bool found_ = false;
    bool refused_ = false;
};

TableOfContentsReader::TableOfContentsReader() : parser_(std::make_unique<Parser>()) {}
TableOfContentsReader::~TableOfContentsReader() = default;

bool TableOfContentsReader::feed(ByteView bytes) {
    return guard_.feed(bytes) && parser_->feed(bytes);
}

std::optional<TableOfContents> TableOfContentsReader::finish() {
    return parser_->finish();
}

}  // namespace pinwell::xar
