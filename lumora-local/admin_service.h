// Requests of clients with a certificate: rights, rates, paths and refusals.
//
// The paths are in a table. Each row has the method, the path, the client's required right, the allowed names
// in a query, and a handler. docs/service/openapi.json describes the requests of /v1.
//
// Refusals have the form application/problem+json (RFC 9457). Refused attempts to issue and revoke are events
// of the log too. Events are kept for ever, so their number is bounded: each client may cause twenty at once
// and one a minute, all clients together a hundred at once and one every ten seconds. Further refusals are
// counted, and the next event's comment has their number. The access log has a line for every request.
//
// The rates of many clients are a bucket of tokens for each name. A bucket holds `burst` tokens and gets one
// back every `interval`. The table is bounded: beyond its bound, the least recently used bucket is removed,
// as if it were full.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <list>
#include <mutex>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "access_list.h"
#include "http_service.h"
#include "record_store.h"
#include "values/date.h"

namespace pinwell::lumora {

/// The rates of clients. For any thread.
class TokenBuckets {
  public:
    using Clock = std::chrono::steady_clock;
    using Now = std::function<Clock::time_point()>;

    struct Allowance {
        std::int64_t burst = 1;
        std::chrono::milliseconds interval{1000};  // between two tokens
    };

    explicit TokenBuckets(Allowance allowance, std::size_t clients = 1024, Now now = Clock::now)
        : allowance_(allowance), clients_(clients), now_(std::move(now)) {}

    /// Takes a token. `nullopt` if there was one; otherwise the number of whole seconds until the next, at
    /// least one.
    std::optional<std::int64_t> take(const std::string& name);

    std::size_t size() const;

  private:
    struct Bucket {
        std::string name;
        Clock::time_point fullAt;  // when all of its tokens are back
    };
    using Buckets = std::list<Bucket>;

    const Allowance allowance_;
    const std::size_t clients_;
    const Now now_;
    mutable std::mutex mutex_;
    Buckets buckets_;  // the most recently used one is first
    std::unordered_map<std::string, Buckets::iterator> places_;
};

/// {"type": "about:blank", "title": the status in words, "status", "detail"}. `detail` is UTF-8 text.
Answer problem(int status, std::string_view detail);

/// The same with Retry-After.
Answer problemForNow(int status, std::string_view detail, std::int64_t seconds);

/// Leaves the work on a request that is refused. The text is the detail.
class Refused : public std::runtime_error {
  public:
    Refused(int status, const std::string& detail) : std::runtime_error(detail), status_(status) {}

    int status() const noexcept { return status_; }

  private:
    int status_;
};

/// A status in words, as RFC 9110 and RFC 6585 name it.
std::string_view titleOf(int status);

/// Writes the events of refused attempts. For any thread.
class RefusalLog {
  public:
    using ErrorLog = std::function<void(std::string_view)>;

    /// `store` must outlive it. `errorLog` hears of events that cannot be written.
    RefusalLog(RecordStore& store, ErrorLog errorLog, TokenBuckets::Now now = TokenBuckets::Clock::now);

    /// Never throws: the request is refused even if the refusal cannot be logged.
    void note(const std::string& client, const RefusedAttempt& attempt, const std::string& why) noexcept;

  private:
    RecordStore& store_;
    const ErrorLog errorLog_;
    TokenBuckets perClient_;
    TokenBuckets overall_;
    std::mutex mutex_;
    std::uint64_t leftOut_ = 0;
};

/// A handler's input. All of it lives until the handler returns.
struct AdminRequest {
    const RequestHead& head;  // `head.client` is the client's name
    std::string_view path;    // the target without its query, unchanged
    Query query;
    Rights rights;
    std::optional<std::string> idempotencyKey;  // of a POST
    std::string_view body;                      // of a POST
};

struct AdminRoute {
    std::string method;                   // "GET", also for HEAD, or "POST"
    std::string path;                     // the whole path; with "*" at its end, the beginning of the path
    bool Rights::*right;                  // that the client needs
    std::vector<std::string> parameters;  // the allowed names in the query

    /// From any thread, several at a time. Throws Refused; any other exception becomes 503.
    std::function<Answer(const AdminRequest&)> handle;

    /// A refusal in the form that this path's clients read. Empty: problem().
    std::function<Answer(int status, std::string_view detail, const RequestHead& head)> refuse{};
};
using AdminRoutes = std::vector<AdminRoute>;

class AdminService final : public HttpService {
  public:
    /// The first row that fits counts. References must outlive the service.
    AdminService(AdminRoutes routes, const AccessList& access, TokenBuckets& rates, RefusalLog& refusals)
        : routes_(std::move(routes)), access_(access), rates_(rates), refusals_(refusals) {}

    std::optional<Answer> answerHead(const RequestHead& head) const override;
    Answer answerBody(const RequestHead& head, std::string_view body) const override;
    Answer refuse(int status, const RequestHead* head) const override;
    Answer refuseForNow(std::string_view reason) const override;
    RequestKind kindOf(std::string_view) const override { return RequestKind::administration; }

  private:
    const AdminRoute* findRoute(const RequestHead& head) const;
    const AdminRoute& routeOf(const RequestHead& head) const;
    Answer refusal(int status, std::string_view detail, const RequestHead& head) const;
    std::string allowedAt(const RequestHead& head) const;
    AdminRequest admit(const RequestHead& head, const AdminRoute& route) const;
    void note(const RequestHead& head, int status, std::string_view detail, std::string_view body) const;

    const AdminRoutes routes_;
    const AccessList& access_;
    TokenBuckets& rates_;
    RefusalLog& refusals_;
};

}  // namespace pinwell::lumora
