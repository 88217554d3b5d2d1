// The URL of an exchange as the transfer library understands it.
#pragma once

#include <curl/curl.h>

#include <string>

#include "foundation/error.h"
#include "foundation/handle.h"
#include "foundation/url.h"

namespace pinwell::https {

using AddressHandle = foundation::Handle<CURLU, curl_url_cleanup>;

struct Target {
    AddressHandle address;
    std::string host;  // without brackets
    std::string port;

    std::string text() const { return host + " port " + port; }
};

/// An error of `unsupportedURL` when the URL is not https, names a user, or names a host that the library
/// would read as another one.
foundation::Result<Target> targetOf(const foundation::URL& url);

}  // namespace pinwell::https
