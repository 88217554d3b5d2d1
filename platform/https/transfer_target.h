// The URL of an exchange, for the transfer library.
#pragma once

#include <memory>
#include <string>

#include "foundation/error.h"
#include "foundation/url.h"

struct Curl_URL;

namespace pinwell::https {

struct AddressDeleter {
    void operator()(Curl_URL* address) const noexcept;
};
using AddressHandle = std::unique_ptr<Curl_URL, AddressDeleter>;

struct Target {
    AddressHandle address;
    std::string host;  // without brackets
    std::string port;

    std::string text() const { return host + " port " + port; }
};

/// Returns an error of `unsupportedURL` if the URL is not https, names a user, or names a host that the
/// library would read as another host.
foundation::Result<Target> targetOf(const foundation::URL& url);

}  // namespace pinwell::https
