#include "https/transfer_target.h"

#include <curl/curl.h>

#include <algorithm>
#include <string_view>

#include "foundation/handle.h"
#include "https/session.h"
#include "https/transfer_error.h"

namespace pinwell::https {
namespace {

using foundation::Result;

std::string partOf(CURLU* address, CURLUPart part, unsigned flags) {
    char* text = nullptr;
    if (curl_url_get(address, part, &text, flags) != CURLUE_OK) return {};
    const foundation::Handle<char, curl_free> owner(text);
    return text;
}

// In the authority, which ends where the path, query or fragment begins (RFC 3986, section 3.2).
bool namesUser(std::string_view text) {
    constexpr std::string_view kMark = "://";
    text.remove_prefix(std::min(text.find(kMark), text.size() - kMark.size()) + kMark.size());
    return text.substr(0, text.find_first_of("/?#")).find('@') != std::string_view::npos;
}

}  // namespace

void AddressDeleter::operator()(Curl_URL* address) const noexcept {
    curl_url_cleanup(address);
}

Result<Target> targetOf(const foundation::URL& url) {
    const std::string text = url.absoluteString();
    const auto refuse = [&text](std::string_view why) {
        return makeError(URLErrorCode::unsupportedURL, "The URL \"" + text + "\" " + std::string(why) + ".");
    };
    if (url.scheme() != "https") return refuse("is not an https URL");
    if (namesUser(text))  // its text would show the password
        return makeError(URLErrorCode::unsupportedURL,
                         "The URL for \"" + url.host() + "\" holds a user name, which is not supported.");
    Target target{AddressHandle(curl_url()), {}, {}};
    const CURLUcode code =
        curl_url_set(target.address.get(), CURLUPART_URL, text.c_str(), CURLU_DISALLOW_USER);
    if (code != CURLUE_OK) return refuse("is malformed");
    target.host = partOf(target.address.get(), CURLUPART_HOST, 0);
    target.port = partOf(target.address.get(), CURLUPART_PORT, CURLU_DEFAULT_PORT);
    if (target.host.starts_with('[') && target.host.ends_with(']'))
        target.host = target.host.substr(1, target.host.size() - 2);
    // The judged name must be the name of the connection, in any spelling.
    const CaseInsensitiveLess less;
    if (less(target.host, url.host()) || less(url.host(), target.host))
        return refuse("has an ambiguous host");
    target.host = url.host();
    return target;
}

}  // namespace pinwell::https
