#include "xar/markup_guard.h"

#include <algorithm>
#include <string_view>

namespace pinwell::xar {
namespace {

using namespace std::string_view_literals;

constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";
constexpr std::string_view kComment = "<!--";
constexpr std::string_view kSection = "<![CDATA[";
constexpr std::size_t kLongestEnd = "-->"sv.size();

bool isWhiteSpace(char c) {
    return c == ' ' || c == '\t' || c == '\r' || c == '\n';
}

}  // namespace

bool MarkupGuard::feed(foundation::ByteView bytes) {
    for (const std::byte byte : bytes) {
        if (state_ == State::refused) return false;
        state_ = next(static_cast<char>(byte));
    }
    return state_ != State::refused;
}

MarkupGuard::State MarkupGuard::next(char c) {
    if (c == '\0') return State::refused;
    if (state_ == State::start || state_ == State::text) {
        if (c == '<') {
            markup_.assign(1, c);
            tail_.clear();
            length_ = 1;
            attributes_ = 0;
            return State::opening;
        }
        if (state_ == State::text || isWhiteSpace(c)) return State::text;
        return length_ < kByteOrderMark.size() && c == kByteOrderMark[length_++] ? State::start
                                                                                 : State::refused;
    }

    if (++length_ > kMaximumMarkup) return State::refused;
    if (state_ == State::opening) {
        markup_ += c;
        return opening();
    }
    if (state_ == State::tag) return inTag(c);
    if (state_ == State::quoted) {
        if (c == '<') return State::refused;
        return c == quote_ ? State::tag : State::quoted;
    }
    if (tail_.size() == kLongestEnd) tail_.erase(0, 1);
    tail_ += c;
    const std::string_view end = state_ == State::comment   ? "-->"sv
                                 : state_ == State::section ? "]]>"sv
                                                            : "?>"sv;
    return std::string_view(tail_).ends_with(end) ? State::text : state_;
}

// What kind of piece has begun; still opening while that cannot be told.
MarkupGuard::State MarkupGuard::opening() {
    if (markup_ == "<?") return State::instruction;
    if (!markup_.starts_with("<!")) return inTag(markup_.back());
    if (markup_ == kComment) return State::comment;
    if (markup_ == kSection) return State::section;
    return kComment.starts_with(markup_) || kSection.starts_with(markup_) ? State::opening : State::refused;
}

MarkupGuard::State MarkupGuard::inTag(char c) {
    if (c == '<') return State::refused;
    if (c == '>') return State::text;
    if (c == '=' && ++attributes_ > kMaximumAttributes) return State::refused;
    if (c != '"' && c != '\'') return State::tag;
    quote_ = c;
    return State::quoted;
}

}  // namespace pinwell::xar
