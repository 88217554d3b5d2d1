// What the service demands of HTTP requests beyond what the parser checks. Refusals are by status: 400, 408,
// 411, 413, 414 or 431.
#pragma once

#include <boost/beast/http/message.hpp>
#include <boost/beast/http/string_body.hpp>
#include <optional>

#include "lumora-local/http_service.h"

namespace pinwell::lumora {

using HttpRequest = boost::beast::http::request<boost::beast::http::string_body>;

/// Whether a body comes after the head.
bool announcesBody(const HttpRequest& request);

/// Whether the client waits for an interim answer before it sends the body (RFC 9110, 10.1.1).
bool expectsContinue(const HttpRequest& request);

/// For heads that no handler may see: an unknown method, a target that is too long, framing that two sides
/// may read differently (RFC 9112, 6.3), no host or two of them.
std::optional<int> refuseHead(const HttpRequest& request);

/// For a request that must bring a body: refused unless it says where the body ends.
std::optional<int> refuseMissingLength(const HttpRequest& request);

RequestHead headOf(const HttpRequest& request);

}  // namespace pinwell::lumora
