#include "https/response_head.h"

#include <charconv>

namespace pinwell::https {
namespace {

constexpr std::string_view kBlank = " \t\r\n";

std::string_view trimmed(std::string_view text) {
    text.remove_prefix(std::min(text.find_first_not_of(kBlank), text.size()));
    return text.substr(0, text.find_last_not_of(kBlank) + 1);
}

// "4", or "4, 4" of a sender, or something on the way, that wrote the field twice.
bool isOneLength(std::string_view list) {
    const std::string_view first = trimmed(list.substr(0, list.find(',')));
    if (first.empty() || first.find_first_not_of("0123456789") != std::string_view::npos) return false;
    while (true) {
        const std::size_t comma = list.find(',');
        if (trimmed(list.substr(0, comma)) != first) return false;
        if (comma == std::string_view::npos) return true;
        list.remove_prefix(comma + 1);
    }
}

}  // namespace

bool ResponseHead::addLine(std::string_view line) {
    bytes_ += line.size();
    if (bytes_ > maximumBytes_) return false;
    if (complete_) return ++fields_ <= maximumFields_;
    if (isAtStart_ && line.starts_with("HTTP/")) {
        startResponse(line);
        return true;
    }
    if (trimmed(line).empty()) {
        complete_ = status_ >= 200;
        isAtStart_ = true;
        return true;
    }
    addField(line);
    return ++fields_ <= maximumFields_;
}

bool ResponseHead::hasPlainFraming() const {
    const auto length = headers_.find("Content-Length");
    if (length != headers_.end() && !isOneLength(length->second)) return false;
    const auto coding = headers_.find("Transfer-Encoding");
    if (coding == headers_.end()) return true;
    const CaseInsensitiveLess less;
    return !less(coding->second, "chunked") && !less("chunked", coding->second);
}

// "HTTP/1.1 200 OK", "HTTP/2 200"
void ResponseHead::startResponse(std::string_view statusLine) {
    isAtStart_ = false;
    isHTTP1_ = statusLine.starts_with("HTTP/1.");
    headers_.clear();
    lastName_.clear();
    status_ = 0;
    std::string_view rest = statusLine.substr(std::min(statusLine.find(' '), statusLine.size()));
    rest = trimmed(rest);
    std::from_chars(rest.data(), rest.data() + rest.size(), status_);
}

void ResponseHead::addField(std::string_view line) {
    const bool continues =
        line.front() == ' ' || line.front() == '\t';  // obsolete folding, RFC 9112, section 5.2
    if (continues) {
        if (const auto field = headers_.find(lastName_); field != headers_.end())
            field->second.append(" ").append(trimmed(line));
        return;
    }
    const std::size_t colon = line.find(':');
    if (colon == std::string_view::npos) return;
    const std::string_view value = trimmed(line.substr(colon + 1));
    lastName_ = trimmed(line.substr(0, colon));
    const auto [field, isNew] = headers_.try_emplace(lastName_, value);
    if (!isNew) field->second.append(", ").append(value);
}

}  // namespace pinwell::https
