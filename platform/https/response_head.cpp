#include "http_message.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <limits>

namespace pinwell::https {
namespace {

constexpr std::string_view kBlank = " \t";

// The fields that the transfer library uses. It may see only the first line of a folded one.
constexpr std::array<std::string_view, 3> kFieldsOnOneLine{"Content-Length", "Transfer-Encoding", "Location"};

bool isDigit(char c) noexcept {
    return c >= '0' && c <= '9';
}

std::string_view trimmed(std::string_view text) {
    text.remove_prefix(std::min(text.find_first_not_of(kBlank), text.size()));
    return text.substr(0, text.find_last_not_of(kBlank) + 1);
}

std::string_view withoutLineEnd(std::string_view line) {
    if (line.ends_with('\n')) line.remove_suffix(1);
    if (line.ends_with('\r')) line.remove_suffix(1);
    return line;
}

bool isSameName(std::string_view a, std::string_view b) {
    const CaseInsensitiveLess less;
    return !less(a, b) && !less(b, a);
}

// "4", or "4, 4" if the sender or a proxy wrote the field twice.
bool isOneLength(std::string_view list) {
    const std::string_view first = trimmed(list.substr(0, list.find(',')));
    if (first.empty() || !std::all_of(first.begin(), first.end(), isDigit)) return false;
    while (true) {
        const std::size_t comma = list.find(',');
        if (trimmed(list.substr(0, comma)) != first) return false;
        if (comma == std::string_view::npos) return true;
        list.remove_prefix(comma + 1);
    }
}

}  // namespace

ResponseHead::Line ResponseHead::addLine(std::string_view line) {
    bytes_ += line.size();
    if (bytes_ > maximumBytes_ || line.size() > kMaximumHeaderLine) return Line::tooLarge;
    if (complete_) return ++fields_ <= maximumFields_ ? Line::taken : Line::tooLarge;
    const std::string_view text = withoutLineEnd(line);
    // RFC 9110, section 5.5: of all control characters only these are dangerous.
    if (text.find_first_of(std::string_view("\0\r\n", 3)) != std::string_view::npos) return Line::malformed;
    if (isAtStart_) return startResponse(text) ? Line::taken : Line::malformed;
    if (text.empty()) {
        complete_ = status_ >= 200;
        isAtStart_ = true;
        return Line::taken;
    }
    if (++fields_ > maximumFields_) return Line::tooLarge;
    return addField(text) ? Line::taken : Line::malformed;
}

bool ResponseHead::isChunked() const {
    const auto coding = headers_.find("Transfer-Encoding");
    return coding != headers_.end() && isSameName(coding->second, "chunked");
}

bool ResponseHead::hasPlainFraming() const {
    const auto length = headers_.find("Content-Length");
    if (length != headers_.end() && !isOneLength(length->second)) return false;
    return !headers_.contains("Transfer-Encoding") || (isHTTP1_ && isChunked());
}

std::optional<std::uint64_t> ResponseHead::bodyLength(std::string_view method) const {
    if (method == "HEAD" || status_ == 204 || status_ == 304) return 0;
    const auto length = headers_.find("Content-Length");
    if (length == headers_.end() || isChunked()) return std::nullopt;
    const std::string_view text =
        trimmed(std::string_view(length->second).substr(0, length->second.find(',')));
    std::uint64_t number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    return error == std::errc{} ? number : std::numeric_limits<std::uint64_t>::max();
}

bool ResponseHead::hasOpenEnd(std::string_view method) const {
    return !bodyLength(method) && !isChunked();
}

// "HTTP/1.1 200 OK", "HTTP/2 200"
bool ResponseHead::startResponse(std::string_view statusLine) {
    constexpr std::array<std::string_view, 3> kVersions{"HTTP/1.0 ", "HTTP/1.1 ", "HTTP/2 "};
    const auto* const version = std::find_if(kVersions.begin(), kVersions.end(), [&](std::string_view text) {
        return statusLine.starts_with(text);
    });
    if (version == kVersions.end()) return false;
    const std::string_view rest = statusLine.substr(version->size());
    const std::string_view digits = rest.substr(0, 3);
    if (digits.size() != 3 || digits[0] == '0' || !std::all_of(digits.begin(), digits.end(), isDigit))
        return false;
    if (rest.size() > 3 && rest[3] != ' ') return false;

    isAtStart_ = false;
    isHTTP1_ = version->starts_with("HTTP/1.");
    headers_.clear();
    lastName_.clear();
    std::from_chars(digits.data(), digits.data() + digits.size(), status_);
    return status_ != 101;  // we never request a switch
}

bool ResponseHead::addField(std::string_view line) {
    if (kBlank.find(line.front()) != std::string_view::npos) return continueField(line);
    const std::size_t colon = line.find(':');
    if (colon == std::string_view::npos || !isToken(line.substr(0, colon))) return false;
    const std::string_view value = trimmed(line.substr(colon + 1));
    lastName_ = line.substr(0, colon);
    const auto [field, isNew] = headers_.try_emplace(lastName_, value);
    if (!isNew) field->second.append(", ").append(value);
    return true;
}

// Obsolete folding (RFC 9112, section 5.2).
bool ResponseHead::continueField(std::string_view line) {
    const auto isLast = [this](std::string_view name) { return isSameName(name, lastName_); };
    if (lastName_.empty() || std::any_of(kFieldsOnOneLine.begin(), kFieldsOnOneLine.end(), isLast))
        return false;
    headers_.find(lastName_)->second.append(" ").append(trimmed(line));
    return true;
}

}  // namespace pinwell::https
