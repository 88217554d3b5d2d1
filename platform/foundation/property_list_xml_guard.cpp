#include <fmt/format.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <system_error>
#include <vector>

#include "foundation/property_list.h"
#include "foundation/property_list_guard.h"

namespace pinwell::foundation {
namespace {

constexpr std::uint32_t kLastCodePoint = 0x10FFFF;
constexpr std::string_view kWhiteSpace = " \t\r\n";

constexpr std::array<std::string_view, 3> kContainers{"plist", "dict", "array"};
constexpr std::array<std::string_view, 8> kLeaves{"key",  "string", "integer", "real",
                                                  "true", "false",  "date",    "data"};

template <std::size_t N>
bool contains(const std::array<std::string_view, N>& names, std::string_view name) {
    return std::find(names.begin(), names.end(), name) != names.end();
}

struct XMLRefusal {
    std::int64_t code;
    std::string text;
};

// Walks the markup, and only the markup. It accepts less than XML does (no quoted angle brackets in a tag, no
// marked section outside text), so that what it and the library take for a tag is the same.
class XMLGuard {
  public:
    explicit XMLGuard(std::string_view document) : document_(document) {}

    void check() {
        if (const std::size_t zero = document_.find('\0'); zero != std::string_view::npos)
            refuse(zero, "zero byte");
        while (nextMarkup()) {
            const std::string_view rest = document_.substr(at_);
            if (rest.starts_with("<?"))
                skipPast("?>", 2);
            else if (rest.starts_with("<!--"))
                skipPast("-->", 4);
            else if (rest.starts_with("<![CDATA["))
                markedSection();
            else if (rest.starts_with("<!"))
                documentType();
            else
                tag();
        }
        if (!open_.empty()) refuse(document_.size(), "an element is not closed");
        if (values_ == 0) refuse(document_.size(), "no value");
    }

  private:
    [[noreturn]] static void refuse(std::size_t offset, std::string_view what) {
        throw XMLRefusal{kMalformedDocument,
                         fmt::format("The property list is malformed at byte {}: {}.", offset, what)};
    }

    bool inLeaf() const { return !open_.empty() && contains(kLeaves, open_.back()); }

    // Moves to the next '<'; what is passed over must be the text of a leaf, or white space.
    bool nextMarkup() {
        const std::size_t next = std::min(document_.find('<', at_), document_.size());
        if (!inLeaf()) {
            const std::size_t stray = document_.find_first_not_of(kWhiteSpace, at_);
            if (stray < next) refuse(stray, "text outside a value");
        } else {
            checkCharacterReferences(document_.substr(at_, next - at_));
        }
        at_ = next;
        return at_ < document_.size();
    }

    // What the library makes of a reference to no character, or to the zero character, is not to be relied
    // on.
    void checkCharacterReferences(std::string_view text) const {
        for (std::size_t at = text.find("&#"); at != std::string_view::npos; at = text.find("&#", at + 1)) {
            const std::size_t semicolon = text.find(';', at);
            if (semicolon == std::string_view::npos) refuse(at_ + at, "reference to no character");
            std::string_view number = text.substr(at + 2, semicolon - (at + 2));
            const int base = number.starts_with('x') ? 16 : 10;
            if (base == 16) number.remove_prefix(1);
            std::uint32_t character = 0;
            const auto [end, fault] =
                std::from_chars(number.data(), number.data() + number.size(), character, base);
            const bool isNumber = fault == std::errc() && end == number.data() + number.size();
            if (!isNumber || character == 0 || character > kLastCodePoint)
                refuse(at_ + at, "reference to no character");
        }
    }

    void skipPast(std::string_view end, std::size_t opening) {
        const std::size_t found = document_.find(end, at_ + opening);
        if (found == std::string_view::npos) refuse(at_, "markup is not closed");
        at_ = found + end.size();
    }

    void markedSection() {
        if (!inLeaf()) refuse(at_, "marked section outside text");
        skipPast("]]>", 9);
    }

    void documentType() {
        const std::string_view rest = document_.substr(at_);
        if (!rest.starts_with("<!DOCTYPE") || !open_.empty() || values_ != 0)
            refuse(at_, "unknown declaration");
        const std::string_view declaration = rest.substr(0, rest.find('>'));
        if (declaration.size() == rest.size()) refuse(at_, "markup is not closed");
        if (declaration.find_first_of("[]") != std::string_view::npos)
            refuse(at_, "document type with an internal subset");
        if (std::count(declaration.begin(), declaration.end(), '"') % 2 != 0)
            refuse(at_, "quoted angle bracket");
        at_ += declaration.size() + 1;
    }

    void tag() {
        const std::size_t end = document_.find('>', at_);
        if (end == std::string_view::npos) refuse(at_, "markup is not closed");
        std::string_view inside = document_.substr(at_ + 1, end - at_ - 1);
        if (inside.find('<') != std::string_view::npos ||
            std::count(inside.begin(), inside.end(), '"') % 2 != 0)
            refuse(at_, "quoted angle bracket");
        if (inside.starts_with('/'))
            closeElement(inside.substr(1));
        else
            openElement(inside);
        at_ = end + 1;
    }

    void openElement(std::string_view inside) {
        const bool isEmpty = inside.ends_with('/');
        if (isEmpty) inside.remove_suffix(1);
        const std::string_view name = inside.substr(0, inside.find_first_of(kWhiteSpace));
        if (!contains(kContainers, name) && !contains(kLeaves, name)) refuse(at_, "unknown element");
        if (inLeaf()) refuse(at_, "an element inside text");
        if (name != "plist" && ++values_ > kMaximumPropertyListValues)
            throw XMLRefusal{kExcessiveDocument, "The property list holds too many values."};
        if (isEmpty) return;
        // The document's own element and the innermost leaf do not count as nesting.
        if (open_.size() >= kMaximumPropertyListDepth + 2)
            throw XMLRefusal{kExcessiveDocument, "The property list is nested too deeply."};
        open_.push_back(name);
    }

    void closeElement(std::string_view inside) {
        const std::string_view name = inside.substr(0, inside.find_first_of(kWhiteSpace));
        if (open_.empty() || open_.back() != name) refuse(at_, "an element is closed that is not open");
        open_.pop_back();
    }

    std::string_view document_;
    std::size_t at_ = 0;
    std::vector<std::string_view> open_;
    std::size_t values_ = 0;
};

}  // namespace

std::optional<Error> refuseXMLPropertyList(ByteView document) {
    const std::string text = toString(document);
    try {
        XMLGuard(text).check();
        return std::nullopt;
    } catch (const XMLRefusal& refusal) {
        return Error(kDataErrorDomain, refusal.code, refusal.text);
    }
}

}  // namespace pinwell::foundation
