// Which answers are redirects, and the request that follows from one (RFC 9110, section 15.4).
#pragma once

#include "https/session.h"

namespace pinwell::https {

/// A 3xx answer that says where to go. Without a Location it is an answer like any other.
bool isRedirect(const HTTPResponse& response);

/// The request to make next. `target` is the Location, resolved against the URL of `request`. 301, 302 and
/// 303 turn a POST into a GET (303 any method but HEAD) and drop the body with the fields that describe it;
/// 307 and 308 keep all. Fields that carry secrets are not taken to another host. Any other redirect, and a
/// target that is not https, is an error.
foundation::Result<Request> requestAfterRedirect(const Request& request, int status,
                                                 const std::string& target);

}  // namespace pinwell::https
