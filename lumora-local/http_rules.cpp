#include <algorithm>
#include <boost/beast/core/string.hpp>

#include "connection.h"

namespace pinwell::lumora {
namespace {

namespace http = boost::beast::http;

// Longer request targets are refused before any other check.
constexpr std::size_t kMaximumTargetLength = 2048;

template <class Text>
std::string text(const Text& view) {
    return {view.data(), view.size()};
}

bool isNumber(const std::string& value) {
    return !value.empty() &&
           std::all_of(value.begin(), value.end(), [](char c) { return c >= '0' && c <= '9'; });
}

}  // namespace

bool announcesBody(const HttpRequest& request) {
    return request.count(http::field::transfer_encoding) > 0 ||
           (request.count(http::field::content_length) > 0 && request[http::field::content_length] != "0");
}

bool expectsContinue(const HttpRequest& request) {
    return boost::beast::iequals(request[http::field::expect], "100-continue");
}

std::optional<int> refuseHead(const HttpRequest& request) {
    const auto lengths = request.count(http::field::content_length);
    const auto codings = request.count(http::field::transfer_encoding);
    if (request.method() == http::verb::unknown || (request.version() != 11 && request.version() != 10)) {
        return 400;
    }
    if (lengths > 1 || codings > 1 || (lengths > 0 && codings > 0)) return 400;
    if (lengths == 1 && !isNumber(text(request[http::field::content_length]))) return 400;
    if (codings == 1 && !boost::beast::iequals(request[http::field::transfer_encoding], "chunked")) {
        return 400;
    }
    // RFC 9112, 3.2: exactly one, which HTTP/1.0 did not have yet.
    const auto hosts = request.count(http::field::host);
    if (hosts > 1 || (hosts == 0 && request.version() == 11)) return 400;
    if (request.target().size() > kMaximumTargetLength) return 414;
    return std::nullopt;
}

std::optional<int> refuseMissingLength(const HttpRequest& request) {
    const bool said =
        request.count(http::field::transfer_encoding) + request.count(http::field::content_length) > 0;
    return said ? std::nullopt : std::optional(411);
}

RequestHead headOf(const HttpRequest& request) {
    RequestHead head{text(request.method_string()), text(request.target()), text(request[http::field::host]),
                     text(request[http::field::content_type]), text(request[http::field::content_encoding])};
    const auto [first, end] = request.equal_range("Idempotency-Key");
    for (auto field = first; field != end; ++field) {
        head.idempotencyKey =
            head.idempotencyKey ? *head.idempotencyKey + ", " + text(field->value()) : text(field->value());
    }
    return head;
}

}  // namespace pinwell::lumora
