// Requests and responses as values, the texts of status codes, and redirects.
#include "http_message.h"

#include <algorithm>
#include <array>

#include "transfer_error.h"

namespace pinwell::https {
namespace {

char lowerCase(char c) {
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

struct StatusText {
    int status;
    std::string_view text;
};

// IANA HTTP Status Code Registry, in lower case; sorted. Numbers registered as unused have no row.
constexpr std::array kStatusTexts{
    StatusText{100, "continue"},
    StatusText{101, "switching protocols"},
    StatusText{102, "processing"},
    StatusText{103, "early hints"},
    StatusText{104, "upload resumption supported"},
    StatusText{200, "ok"},
    StatusText{201, "created"},
    StatusText{202, "accepted"},
    StatusText{203, "non-authoritative information"},
    StatusText{204, "no content"},
    StatusText{205, "reset content"},
    StatusText{206, "partial content"},
    StatusText{207, "multi-status"},
    StatusText{208, "already reported"},
    StatusText{226, "im used"},
    StatusText{300, "multiple choices"},
    StatusText{301, "moved permanently"},
    StatusText{302, "found"},
    StatusText{303, "see other"},
    StatusText{304, "not modified"},
    StatusText{305, "use proxy"},
    StatusText{307, "temporary redirect"},
    StatusText{308, "permanent redirect"},
    StatusText{400, "bad request"},
    StatusText{401, "unauthorized"},
    StatusText{402, "payment required"},
    StatusText{403, "forbidden"},
    StatusText{404, "not found"},
    StatusText{405, "method not allowed"},
    StatusText{406, "not acceptable"},
    StatusText{407, "proxy authentication required"},
    StatusText{408, "request timeout"},
    StatusText{409, "conflict"},
    StatusText{410, "gone"},
    StatusText{411, "length required"},
    StatusText{412, "precondition failed"},
    StatusText{413, "content too large"},
    StatusText{414, "uri too long"},
    StatusText{415, "unsupported media type"},
    StatusText{416, "range not satisfiable"},
    StatusText{417, "expectation failed"},
    StatusText{421, "misdirected request"},
    StatusText{422, "unprocessable content"},
    StatusText{423, "locked"},
    StatusText{424, "failed dependency"},
    StatusText{425, "too early"},
    StatusText{426, "upgrade required"},
    StatusText{428, "precondition required"},
    StatusText{429, "too many requests"},
    StatusText{431, "request header fields too large"},
    StatusText{451, "unavailable for legal reasons"},
    StatusText{500, "internal server error"},
    StatusText{501, "not implemented"},
    StatusText{502, "bad gateway"},
    StatusText{503, "service unavailable"},
    StatusText{504, "gateway timeout"},
    StatusText{505, "http version not supported"},
    StatusText{506, "variant also negotiates"},
    StatusText{507, "insufficient storage"},
    StatusText{508, "loop detected"},
    StatusText{510, "not extended"},
    StatusText{511, "network authentication required"},
};

// RFC 9110, section 15: the class is the first digit.
std::string_view classText(int status) {
    if (status < 100 || status > 599) return "unknown status";
    constexpr std::array<std::string_view, 5> kClasses{"informational", "success", "redirection",
                                                       "client error", "server error"};
    return kClasses[static_cast<std::size_t>(status / 100 - 1)];
}

bool isFollowed(int status) {
    return status == 301 || status == 302 || status == 303 || status == 307 || status == 308;
}

bool becomesGet(const std::string& method, int status) {
    if (status == 301 || status == 302) return method == "POST";
    return status == 303 && method != "HEAD";
}

// Scheme, host and port before the path: two URLs with the same origin use the same server.
std::string_view originOf(const std::string& text) {
    const std::size_t authority = text.find("://");
    if (authority == std::string::npos) return text;
    return std::string_view(text).substr(0, text.find_first_of("/?#", authority + 3));
}

}  // namespace

bool CaseInsensitiveLess::operator()(std::string_view a, std::string_view b) const noexcept {
    return std::lexicographical_compare(a.begin(), a.end(), b.begin(), b.end(),
                                        [](char x, char y) { return lowerCase(x) < lowerCase(y); });
}

void Request::addHeader(std::string_view name, std::string_view value) {
    const auto [field, isNew] = headers.try_emplace(std::string(name), value);
    if (!isNew) field->second.append(", ").append(value);
}

std::optional<std::string> HTTPResponse::header(std::string_view name) const {
    const auto field = headers.find(name);
    if (field == headers.end()) return std::nullopt;
    return field->second;
}

bool isToken(std::string_view text) noexcept {
    const auto tokenCharacter = [](char c) {
        return (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') ||
               std::string_view("!#$%&'*+-.^_`|~").find(c) != std::string_view::npos;
    };
    return !text.empty() && std::all_of(text.begin(), text.end(), tokenCharacter);
}

bool isFieldValue(std::string_view text) noexcept {
    return std::none_of(text.begin(), text.end(), [](char c) {
        const auto byte = static_cast<unsigned char>(c);
        return (byte < 0x20 && c != '\t') || byte == 0x7F;
    });
}

std::string localizedStringForStatusCode(int status) {
    const auto row =
        std::lower_bound(kStatusTexts.begin(), kStatusTexts.end(), status,
                         [](const StatusText& entry, int wanted) { return entry.status < wanted; });
    const bool registered = row != kStatusTexts.end() && row->status == status;
    return std::string(registered ? row->text : classText(status));
}

bool isRedirect(const HTTPResponse& response) {
    return response.status >= 300 && response.status < 400 && response.header("Location").has_value();
}

Result<Request> requestAfterRedirect(const Request& request, int status, const std::string& target) {
    if (!isFollowed(status))
        return makeError(URLErrorCode::unsupportedURL, "The server \"" + request.url->host() +
                                                           "\" answered with an unknown redirect (" +
                                                           std::to_string(status) + ").");
    const std::optional<URL> url = URL::fromString(target);
    if (!url || url->scheme() != "https")
        return makeError(URLErrorCode::unsupportedURL, "The server \"" + request.url->host() +
                                                           "\" redirects to what is not an https URL: \"" +
                                                           target + "\".");
    Request next = request;
    next.url = url;
    if (becomesGet(request.method, status)) {
        next.method = "GET";
        next.body.clear();
        std::erase_if(next.headers, [](const auto& field) {
            const CaseInsensitiveLess less;
            const std::string_view prefix = std::string_view(field.first).substr(0, 8);
            return !less(prefix, "Content-") && !less("Content-", prefix);
        });
    }
    if (originOf(url->absoluteString()) != originOf(request.url->absoluteString()))
        for (const std::string_view name : {"Authorization", "Cookie", "Proxy-Authorization"})
            if (const auto field = next.headers.find(name); field != next.headers.end())
                next.headers.erase(field);
    return next;
}

}  // namespace pinwell::https

namespace pinwell::values {

std::string Description<https::HTTPResponse>::of(const https::HTTPResponse& response) {
    std::string text = "{ URL: " + base::escapeForTerminal(response.url.absoluteString()) +
                       " } { Status Code: " + std::to_string(response.status) + ", Headers { ";
    for (const auto& [name, value] : response.headers)
        text += quoteForPropertyList(name) + " = " + quoteForPropertyList(value) + "; ";
    return text + "} }";
}

}  // namespace pinwell::values
