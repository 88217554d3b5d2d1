#include "admin_service.h"

#include <algorithm>
#include <exception>
#include <utility>

#include "admin_routes.h"
#include "base/text.h"
#include "values/format.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using values::Dictionary;
using values::format;

}  // namespace

std::optional<std::int64_t> TokenBuckets::take(const std::string& name) {
    const std::lock_guard lock(mutex_);
    const Clock::time_point now = now_();
    const auto place = places_.find(name);
    if (place != places_.end()) {
        buckets_.splice(buckets_.begin(), buckets_, place->second);
    } else {
        if (buckets_.size() >= clients_) {
            places_.erase(buckets_.back().name);
            buckets_.pop_back();
        }
        buckets_.push_front({name, now});
        places_[name] = buckets_.begin();
    }
    Clock::time_point& fullAt = buckets_.front().fullAt;
    const Clock::time_point after = std::max(fullAt, now) + allowance_.interval;
    const Clock::time_point latest = now + allowance_.interval * allowance_.burst;
    if (after > latest) {
        const auto wait = std::chrono::ceil<std::chrono::seconds>(after - latest);
        return std::max<std::int64_t>(wait.count(), 1);
    }
    fullAt = after;
    return std::nullopt;
}

std::size_t TokenBuckets::size() const {
    const std::lock_guard lock(mutex_);
    return buckets_.size();
}

std::string_view titleOf(int status) {
    switch (status) {
        case 400:
            return "Bad Request";
        case 403:
            return "Forbidden";
        case 404:
            return "Not Found";
        case 405:
            return "Method Not Allowed";
        case 408:
            return "Request Timeout";
        case 409:
            return "Conflict";
        case 411:
            return "Length Required";
        case 413:
            return "Content Too Large";
        case 414:
            return "URI Too Long";
        case 415:
            return "Unsupported Media Type";
        case 422:
            return "Unprocessable Content";
        case 429:
            return "Too Many Requests";
        case 431:
            return "Request Header Fields Too Large";
        case 503:
            return "Service Unavailable";
        default:
            return "Internal Server Error";
    }
}

Answer problem(int status, std::string_view detail) {
    Answer answer;
    answer.status = status;
    answer.contentType = "application/problem+json";
    // The detail may repeat the client's text: without control characters, and in UTF-8.
    const auto document = values::serializeJSON(Dictionary{{"type", "about:blank"},
                                                           {"title", titleOf(status)},
                                                           {"status", status},
                                                           {"detail", base::escapeForDisplay(detail)}});
    answer.body = document ? base::toString(*document) : std::string("{}");
    return answer;
}

Answer problemForNow(int status, std::string_view detail, std::int64_t seconds) {
    Answer answer = problem(status, detail);
    answer.headers.emplace_back("Retry-After", std::to_string(seconds));
    return answer;
}

namespace {

constexpr TokenBuckets::Allowance kPerClient{20, std::chrono::minutes(1)};
constexpr TokenBuckets::Allowance kOverall{100, std::chrono::seconds(10)};
constexpr std::size_t kClients = 1024;

}  // namespace

RefusalLog::RefusalLog(RecordStore& store, ErrorLog errorLog, TokenBuckets::Now now)
    : store_(store),
      errorLog_(std::move(errorLog)),
      perClient_(kPerClient, kClients, now),
      overall_(kOverall, 1, std::move(now)) {}

void RefusalLog::note(const std::string& client, const RefusedAttempt& attempt,
                      const std::string& why) noexcept {
    try {
        std::uint64_t leftOut = 0;
        {
            const std::lock_guard lock(mutex_);
            if (perClient_.take(client) || overall_.take("")) {
                ++leftOut_;
                return;
            }
            leftOut = std::exchange(leftOut_, 0);
        }
        Occasion occasion{values::Date::now(), client, std::nullopt, why, false};
        if (leftOut > 0) {
            occasion.comment += format(" (%llu more attempts before it are not in the log)",
                                       static_cast<unsigned long long>(leftOut));
        }
        store_.noteRefusal(attempt, occasion);
    } catch (const std::exception& error) {
        try {
            errorLog_(format("cannot note a refused attempt of %@: %s", client, error.what()));
        } catch (const std::exception&) {
            return;  // there is no one left to report to
        }
    }
}

namespace {

constexpr std::int64_t kRetryAfter = 1;

bool fits(const AdminRoute& route, std::string_view path) {
    if (!route.path.ends_with('*')) return route.path == path;
    return path.starts_with(std::string_view(route.path).substr(0, route.path.size() - 1));
}

bool fits(const AdminRoute& route, std::string_view path, std::string_view method) {
    return fits(route, path) && (route.method == method || (route.method == "GET" && method == "HEAD"));
}

/// A response is only for its client, and is of its stated type.
Answer withCommonHeaders(Answer answer) {
    answer.headers.emplace_back("Cache-Control", "no-store");
    answer.headers.emplace_back("X-Content-Type-Options", "nosniff");
    return answer;
}

std::string_view nameOf(bool Rights::*right) {
    if (right == &Rights::issue) return "issue";
    return right == &Rights::revoke ? "revoke" : "read";
}

/// Whether a refusal with this status is about the request itself, not about the moment.
bool isClientsFault(int status) {
    return status >= 400 && status < 500 && status != 408 && status != 429;
}

}  // namespace

const AdminRoute* AdminService::findRoute(const RequestHead& head) const {
    const std::string_view path = pathOf(head.target);
    for (const AdminRoute& route : routes_) {
        if (fits(route, path, head.method)) return &route;
    }
    return nullptr;
}

Answer AdminService::refusal(int status, std::string_view detail, const RequestHead& head) const {
    const AdminRoute* const route = findRoute(head);
    return route != nullptr && route->refuse ? route->refuse(status, detail, head) : problem(status, detail);
}

const AdminRoute& AdminService::routeOf(const RequestHead& head) const {
    if (const AdminRoute* const route = findRoute(head)) return *route;
    const std::string methods = allowedAt(head);
    if (methods.empty()) throw Refused(404, "there is nothing at this path");
    throw Refused(405, format("the method here is %s", methods));
}

AdminRequest AdminService::admit(const RequestHead& head, const AdminRoute& route) const {
    AdminRequest request{head, pathOf(head.target), {}, access_.of(head.client), std::nullopt, {}};
    if (!(request.rights.*route.right)) {
        throw Refused(403,
                      format("access.toml does not give %@ the role %s", head.client, nameOf(route.right)));
    }
    std::optional<Query> query = parseQuery(head.target);
    if (!query) throw Refused(400, "the query is malformed");
    for (const auto& [name, value] : *query) {
        if (std::find(route.parameters.begin(), route.parameters.end(), name) == route.parameters.end())
            throw Refused(400, format("\"%@\" is no parameter of this request", name.substr(0, 64)));
    }
    request.query = *std::move(query);
    if (route.method != "POST") return request;
    if (!isJson(head.contentType)) throw Refused(415, "the content type of this request is application/json");
    if (!head.contentEncoding.empty() && head.contentEncoding != "identity")
        throw Refused(415, "the body is sent without a content encoding");
    if (head.idempotencyKey) request.idempotencyKey = parseIdempotencyKey(*head.idempotencyKey);
    return request;
}

std::optional<Answer> AdminService::answerHead(const RequestHead& head) const {
    if (const auto seconds = rates_.take(head.client)) {
        Answer answer = refusal(429, "too many requests of this client", head);
        answer.headers.emplace_back("Retry-After", std::to_string(*seconds));
        return withCommonHeaders(std::move(answer));
    }
    try {
        const AdminRoute& route = routeOf(head);
        const AdminRequest request = admit(head, route);
        if (route.method == "POST") return std::nullopt;
        return withCommonHeaders(route.handle(request));
    } catch (const Refused& refused) {
        note(head, refused.status(), refused.what(), {});
        Answer answer = refusal(refused.status(), refused.what(), head);
        if (refused.status() == 405) answer.headers.emplace_back("Allow", allowedAt(head));
        return withCommonHeaders(std::move(answer));
    }
}

Answer AdminService::answerBody(const RequestHead& head, std::string_view body) const {
    try {
        const AdminRoute& route = routeOf(head);
        AdminRequest request = admit(head, route);
        request.body = body;
        return withCommonHeaders(route.handle(request));
    } catch (const Refused& refused) {
        note(head, refused.status(), refused.what(), body);
        return withCommonHeaders(refusal(refused.status(), refused.what(), head));
    }
}

Answer AdminService::refuse(int status, const RequestHead* head) const {
    const std::string_view detail = [status]() -> std::string_view {
        switch (status) {
            case 408:
                return "the request took too long to arrive";
            case 411:
                return "the request does not say how long its body is";
            case 413:
                return "the body has more than 1 MiB";
            case 414:
                return "the request's target is too long";
            case 431:
                return "the request's headers are too large";
            default:
                return "the request is malformed";
        }
    }();
    if (head != nullptr) note(*head, status, detail, {});
    return withCommonHeaders(problem(status, detail));
}

Answer AdminService::refuseForNow(std::string_view) const {
    return withCommonHeaders(
        problemForNow(503,
                      "the request cannot be carried out at the moment; whether it changed something may be "
                      "unknown. The same request with the same Idempotency-Key is safe",
                      kRetryAfter));
}

void AdminService::note(const RequestHead& head, int status, std::string_view detail,
                        std::string_view body) const {
    const std::string_view path = pathOf(head.target);
    const bool changes =
        head.method == "POST" && std::any_of(routes_.begin(), routes_.end(), [&](const AdminRoute& route) {
            return route.method == "POST" && fits(route, path);
        });
    if (!changes || !isClientsFault(status)) return;
    refusals_.note(head.client, attemptIn(body),
                   format("%d %s: POST %s: %@", status, titleOf(status), path, detail));
}

std::string AdminService::allowedAt(const RequestHead& head) const {
    std::string methods;
    for (const AdminRoute& route : routes_) {
        if (fits(route, pathOf(head.target))) methods += (methods.empty() ? "" : ", ") + route.method;
    }
    return methods;
}

}  // namespace pinwell::lumora
