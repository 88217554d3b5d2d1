// The service's rules for HTTP requests beyond the parser's checks. Refusals are a status: 400, 408, 411,
// 413, 414 or 431.
#pragma once

#include <boost/beast/http/message.hpp>
#include <boost/beast/http/string_body.hpp>
#include <optional>

#include "lumora-local/http_service.h"

namespace pinwell::lumora {

using HttpRequest = boost::beast::http::request<boost::beast::http::string_body>;

/// Whether a body follows the head.
bool announcesBody(const HttpRequest& request);

/// Whether the client waits for an interim response before it sends the body (RFC 9110, 10.1.1).
bool expectsContinue(const HttpRequest& request);

/// Refuses heads before any handler: an unknown method, a target that is too long, framing that two sides may
/// read differently (RFC 9112, 6.3), no host or two hosts.
std::optional<int> refuseHead(const HttpRequest& request);

/// Refuses a request that must have a body and does not state its end.
std::optional<int> refuseMissingLength(const HttpRequest& request);

RequestHead headOf(const HttpRequest& request);

}  // namespace pinwell::lumora
