// Asks a record service to issue tickets, on its administration listener (docs/service/openapi.json).
//
//   POST URL/v1/tickets    application/json, Idempotency-Key
//        {"record":"2/2/...","hashes":["2/2/...",...],"label":"...","reinstate":true,"comment":"..."}
//     -> 200 or 201, application/json
//        {"record":"2/2/...","action":"issued","ticket":BASE64,"event":SHA-256 in hexadecimal,...}
//     -> another status, application/problem+json (RFC 9457); "detail" is shown to the user
//
// The service is not trusted: its ticket is judged like a fetched one, and must list every requested
// hash.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "formats/code_hashes.h"
#include "retrieval/connection.h"
#include "retrieval/retry_policy.h"
#include "retrieval/ticket_fetch.h"
#include "src/platform.h"
#include "values/url.h"

namespace pinwell::retrieval {

/// A wish for a ticket for one artefact.
struct TicketWish {
    std::vector<CodeHash> hashes;  // for the ticket to list, the artefact's own first; never empty
    std::string label;             // its name for people; in UTF-8
    bool reinstates = false;       // even if the record is revoked
    std::string comment{};         // for the service's log; in UTF-8
};

struct RequestOptions {
    values::URL service;  // "https://HOST:PORT", maybe with a path before the listener's
    RetryPolicy retry;

    /// The end of all; unfinished wishes are timedOut.
    std::optional<Clock::time_point> deadline;
};

struct RequestedTicket {
    /// The ticket and its judgement. A refusal of the service is notIssued; for a revoked record it is
    /// revoked.
    FetchedTicket fetched;

    /// The service's action, as in its log; empty without a ticket.
    std::string action;  // "issued", "reissued" or "reinstated"
    std::string event;   // the hash of the log's entry, in hexadecimal
};

/// The URL of the service. `nullopt` if the text is not an https URL, names a user, or has a query or a
/// fragment.
std::optional<values::URL> serviceURLOf(std::string_view text);

/// For one thread.
class TicketRequests {
  public:
    /// The platform's sessions must send the client's certificate, and must not follow redirects.
    TicketRequests(const Platform& platform, RequestOptions options, Cancellation& cancellation);

    /// Blocks, and retries after lost connections, 429, 502, 503 and 504. The tries for one wish have one
    /// Idempotency-Key, so that the service carries it out once. No two wishes have the same key, in any
    /// process. If the service is unreachable after all tries, or not trusted, later wishes end the same way
    /// without a request.
    RequestedTicket request(const TicketWish& wish);

    /// Why no more wishes are sent: timedOut or interrupted. `nullopt` if they still are.
    std::optional<Cause> end() const;

  private:
    struct Try {
        bool mayBeRepeated = false;
        std::optional<std::chrono::seconds> retryAfter{};  // the delay that the service asks for
    };
    Try attempt(const TicketWish& wish, const https::Request& request, RequestedTicket& result);
    Try takeResponse(const TicketWish& wish, const Exchange& exchange, RequestedTicket& result) const;
    void takeIssued(const TicketWish& wish, const Exchange& exchange, RequestedTicket& result) const;
    bool hasEnded(FetchedTicket& result) const;

    const Platform platform_;
    const RequestOptions options_;
    Cancellation& cancellation_;
    Connection connection_;
    Cancellation::Use use_;
    std::optional<FetchedTicket> lost_;  // the failure after which the service was given up
};

}  // namespace pinwell::retrieval
