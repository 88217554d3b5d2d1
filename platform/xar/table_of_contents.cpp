#include "xar/table_of_contents.h"

#include <string_view>
#include <utility>

#include "values/xml_parser.h"

namespace pinwell::xar {
namespace {

using base::ByteView;
using values::XMLAttributes;
using values::XMLParser;

struct Refusal {};

bool isBlank(std::string_view text) {
    return text.find_first_not_of(" \t\r\n") == std::string_view::npos;
}

bool decidesTheChecksum(std::string_view path) {
    return path == "checksum" || path == "checksum/offset" || path == "checksum/size";
}

// The second name was added later, so that older readers are not confused: they read it as a property.
bool isSignature(std::string_view name) {
    return name == "signature" || name == "x-signature";
}

// The name after the prefix, declared or not.
std::string_view localName(std::string_view name) {
    const std::size_t colon = name.find(':');
    if (colon == std::string_view::npos) return name;
    const std::string_view local = name.substr(colon + 1);
    if (colon == 0 || local.empty() || local.find(':') != std::string_view::npos) throw Refusal{};
    return local;
}

}  // namespace

class TableOfContentsReader::Document final : public values::XMLEvents {
  public:
    XMLParser& parser() { return parser_; }

    TableOfContents take() {
        if (!found_) throw Refusal{};
        return std::move(table_);
    }

  private:
    // An open element that is a property.
    struct Property {
        std::size_t parentPath;  // length of the path of its parent
        bool counts;             // the first one of its path
        std::string text;        // so far
    };

    static constexpr std::size_t kRoot = 1;
    static constexpr std::size_t kTable = 2;
    static constexpr std::size_t kChildOfTable = 3;

    bool passingOver() const { return passedOver_ != 0; }

    void passOver() { passedOver_ = depth_; }

    void begin(std::string_view qualifiedName, const XMLAttributes& attributes) override {
        ++depth_;
        if (depth_ > kMaximumDepth || ++elements_ > kMaximumElements) throw Refusal{};
        if (passingOver()) return;
        const std::string_view name = localName(qualifiedName);
        if (depth_ == kRoot) {
            if (name != "xar") throw Refusal{};
        } else if (depth_ == kTable) {
            if (name != "toc") return passOver();
            if (std::exchange(found_, true)) throw Refusal{};
        } else if (depth_ == kChildOfTable && isSignature(name)) {
            if (table_.signatures.size() == kMaximumSignatures) throw Refusal{};
            table_.signatures.push_back(styleAmong(attributes));
            passOver();
        } else if (depth_ == kChildOfTable && name == "file") {
            passOver();
        } else {
            beginProperty(name, attributes);
        }
    }

    void beginProperty(std::string_view name, const XMLAttributes& attributes) {
        if (name.size() + 1 > kMaximumPath - path_.size()) throw Refusal{};
        const std::size_t parentPath = path_.size();
        if (!path_.empty()) path_ += '/';
        path_ += name;
        const bool isFirst = table_.properties.emplace(path_, std::nullopt).second;
        if (table_.properties.size() > kMaximumProperties) throw Refusal{};
        if (!isFirst && decidesTheChecksum(path_)) throw Refusal{};
        if (path_ == "checksum") table_.checksumStyle = styleAmong(attributes);
        open_.push_back({parentPath, isFirst, {}});
    }

    void end(std::string_view) override {
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

    void text(std::string_view piece) override {
        if (passingOver() || open_.empty() || !open_.back().counts) return;
        keep(piece.size());
        open_.back().text += piece;
    }

    std::optional<std::string> styleAmong(const XMLAttributes& attributes) {
        const auto style = attributes["style"];
        if (!style) return std::nullopt;
        keep(style->size());
        return std::string(*style);
    }

    void keep(std::size_t length) {
        if (length > kMaximumKept - kept_) throw Refusal{};
        kept_ += length;
    }

    XMLParser parser_{*this, XMLParser::DocumentType::refused};
    TableOfContents table_;
    std::vector<Property> open_;
    std::string path_;
    std::size_t depth_ = 0;
    std::size_t passedOver_ = 0;  // the depth of the skipped element; 0 for none
    std::size_t elements_ = 0;
    std::size_t kept_ = 0;
    bool found_ = false;
};

TableOfContentsReader::TableOfContentsReader() : document_(std::make_unique<Document>()) {}
TableOfContentsReader::~TableOfContentsReader() = default;

bool TableOfContentsReader::feed(ByteView bytes) try {
    document_->parser().feed(bytes);
    return true;
} catch (const values::MalformedXML&) {
    return false;
} catch (const Refusal&) {
    return false;
}

std::optional<TableOfContents> TableOfContentsReader::finish() try {
    document_->parser().finish();
    return document_->take();
} catch (const values::MalformedXML&) {
    return std::nullopt;
} catch (const Refusal&) {
    return std::nullopt;
}

}  // namespace pinwell::xar
