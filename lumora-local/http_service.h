// The handling of HTTP requests, without sockets: heads, targets with their queries, and responses.
#pragma once

#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/bytes.h"
#include "service_counts.h"

namespace pinwell::lumora {

inline constexpr std::size_t kMaximumBodySize = 1024 * 1024;

/// A request up to its body. `target` is the request line's, unchanged; missing header values are
/// empty.
struct RequestHead {
    std::string method;
    std::string target;
    std::string host;
    std::string contentType;
    std::string contentEncoding;
    std::optional<std::string> idempotencyKey{};  // several headers of this name are joined by ", "
    std::string client{};  // common name of its certificate, if the server requires one
};

struct Answer {
    int status = 200;
    std::string contentType = "application/json";
    std::string body;
    std::shared_ptr<const base::Data> asset;  // used instead of `body`; downloads of one ticket share it
    std::vector<std::pair<std::string, std::string>> headers;
    std::vector<std::string> records;   // the looked-up names, for the log
    std::size_t recordsFound = 0;       // of them
    std::size_t recordsFromMemory = 0;  // of the found records
};

/// Calls may come from any thread, several at a time. An exception of answerHead() or answerBody() becomes
/// the response of refuseForNow().
class HttpService {
  public:
    virtual ~HttpService() = default;

    /// The response, if the head is enough to decide it; `nullopt` if the body must be read and passed to
    /// answerBody().
    virtual std::optional<Answer> answerHead(const RequestHead& head) const = 0;

    /// The response to a request whose head was accepted.
    virtual Answer answerBody(const RequestHead& head, std::string_view body) const = 0;

    /// The refusal of a request that breaks the rules of HTTP (http_rules.cpp). `head` is null if it was not
    /// read.
    virtual Answer refuse(int status, const RequestHead* head) const = 0;

    /// A temporary refusal: 503, with Retry-After.
    virtual Answer refuseForNow(std::string_view reason) const = 0;

    /// For counting. Independent of the response.
    virtual RequestKind kindOf(std::string_view) const { return RequestKind::other; }
};

/// The target without its query.
std::string_view pathOf(std::string_view target);

/// Whether this is the media type application/json. Case and parameters do not count (RFC 9110, 8.3.1).
bool isJson(std::string_view contentType);

/// Names and values, decoded: "%" and two hexadecimal digits is a byte, "+" is a space (as forms are sent).
using Query = std::map<std::string, std::string, std::less<>>;

/// The text after the first "?" of the target, up to a "#". `nullopt` if it is malformed: a name that is
/// empty or occurs twice, a "%" without its digits, a byte 0, text that is not UTF-8.
std::optional<Query> parseQuery(std::string_view target);

/// `nullopt` for a "%" without its digits.
std::optional<std::string> percentDecoded(std::string_view text);

}  // namespace pinwell::lumora
