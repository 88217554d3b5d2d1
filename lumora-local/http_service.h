// What a server does with HTTP requests, without a socket in sight.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "foundation/bytes.h"
#include "lumora-local/service_counts.h"

namespace pinwell::lumora {

inline constexpr std::size_t kMaximumBodySize = 1024 * 1024;

/// A request up to its body. `target` is as it stood in the request line; header values are empty when
/// absent.
struct RequestHead {
    std::string method;
    std::string target;
    std::string host;
    std::string contentType;
    std::string contentEncoding;
    std::optional<std::string> idempotencyKey{};  // several headers of this name are joined by ", "
    std::string client{};  // common name of its certificate, if the server asks for one
};

struct Answer {
    int status = 200;
    std::string contentType = "application/json";
    std::string body;
    std::shared_ptr<const foundation::Data>
        asset;  // in the place of `body`; downloads of one ticket share it
    std::vector<std::pair<std::string, std::string>> headers;
    std::vector<std::string> records;   // the names that were looked up, for the log
    std::size_t recordsFound = 0;       // of them
    std::size_t recordsFromMemory = 0;  // of those found
};

/// Calls may come from any thread, several at a time. What answerHead() and answerBody() throw becomes the
/// answer of refuseForNow().
class HttpService {
  public:
    virtual ~HttpService() = default;

    /// The answer as far as the head decides it; `nullopt` if the body must be read and handed to
    /// answerBody().
    virtual std::optional<Answer> answerHead(const RequestHead& head) const = 0;

    /// The answer to a request whose head was accepted.
    virtual Answer answerBody(const RequestHead& head, std::string_view body) const = 0;

    /// The refusal of a request that is at fault by the rules of HTTP alone (http_rules.h). `head` is null if
    /// it was not read.
    virtual Answer refuse(int status, const RequestHead* head) const = 0;

    /// A refusal that time may mend: 503, with Retry-After.
    virtual Answer refuseForNow(std::string_view reason) const = 0;

    /// For counting. Says nothing about what the answer will be.
    virtual RequestKind kindOf(std::string_view) const { return RequestKind::other; }
};

/// The target without its query.
std::string_view pathOf(std::string_view target);

/// Whether this is the media type application/json. Case and parameters do not count (RFC 9110, 8.3.1).
bool isJson(std::string_view contentType);

}  // namespace pinwell::lumora
