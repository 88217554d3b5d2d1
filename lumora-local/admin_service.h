// Requests of clients with a certificate: rights, rates and paths.
//
// The paths are in a table. Each row has the method, the path, the client's required right, the allowed names
// in a query, and a handler. docs/service/openapi.json describes the requests of /v1.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "lumora-local/access_list.h"
#include "lumora-local/http_service.h"
#include "lumora-local/refusal_log.h"
#include "lumora-local/token_buckets.h"

namespace pinwell::lumora {

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
