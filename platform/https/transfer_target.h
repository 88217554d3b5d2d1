// The URL of an exchange as the transfer library understands it.
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

/// An error of `unsupportedURL` when the URL is not https, names a user, or names a host that the library
/// would read as another one.
foundation::Result<Target> targetOf(const foundation::URL& url);

}  // namespace pinwell::https
