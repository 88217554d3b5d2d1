// Requests of clients that have a certificate: who may do what, how often, and what is at which path.
//
// The paths are in a table. Each row names the method, the path, the right that a client needs, the names
// that a query may have, and a handler. docs/service/openapi.json describes the requests of /v1.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "lumora-local/access_list.h"
#include "lumora-local/http_service.h"
#include "lumora-local/query.h"
#include "lumora-local/refusal_log.h"
#include "lumora-local/token_buckets.h"

namespace pinwell::lumora {

/// What a handler gets. All of it lives until the handler returns.
struct AdminRequest {
    const RequestHead& head;  // `head.client` is who asks
    std::string_view path;    // the target without its query, as it was sent
    Query query;
    Rights rights;
    std::optional<std::string> idempotencyKey;  // of a POST
    std::string_view body;                      // of a POST
};

struct AdminRoute {
    std::string method;                   // "GET", with which HEAD is answered too, or "POST"
    std::string path;                     // whole; if it ends with "*", how the path begins
    bool Rights::*right;                  // that the client needs
    std::vector<std::string> parameters;  // names that the query may have

    /// From any thread, several at a time. Throws Refused; anything else that it throws becomes 503.
    std::function<Answer(const AdminRequest&)> handle;
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
    const AdminRoute& routeOf(const RequestHead& head) const;
    std::string allowedAt(const RequestHead& head) const;
    AdminRequest admit(const RequestHead& head, const AdminRoute& route) const;
    void note(const RequestHead& head, int status, std::string_view detail, std::string_view body) const;

    const AdminRoutes routes_;
    const AccessList& access_;
    TokenBuckets& rates_;
    RefusalLog& refusals_;
};

}  // namespace pinwell::lumora
