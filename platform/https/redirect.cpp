#include "https/redirect.h"

#include "https/transfer_error.h"

namespace pinwell::https {
namespace {

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

bool isRedirect(const HTTPResponse& response) {
    return response.status >= 300 && response.status < 400 && response.header("Location").has_value();
}

foundation::Result<Request> requestAfterRedirect(const Request& request, int status,
                                                 const std::string& target) {
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
