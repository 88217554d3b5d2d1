// Recognises redirects, and makes the next request (RFC 9110, section 15.4).
#pragma once

#include "https/session.h"

namespace pinwell::https {

/// Whether it is a 3xx response with a Location. Without one it is a response like any other.
bool isRedirect(const HTTPResponse& response);

/// The next request. `target` is the Location, resolved against the URL of `request`. 301, 302 and 303 turn a
/// POST into a GET (303 any method except HEAD) and drop the body with the fields that describe it; 307 and
/// 308 keep all. Fields with secrets are not sent to another host. Any other redirect, and a target that is
/// not https, is an error.
foundation::Result<Request> requestAfterRedirect(const Request& request, int status,
                                                 const std::string& target);

}  // namespace pinwell::https
