// Asks a record service to issue tickets, on its administration listener (docs/service/openapi.json).
//
//   POST URL/v1/tickets    application/json, Idempotency-Key
//        {"record":"2/2/...","hashes":["2/2/...",...],"label":"...","reinstate":true,"comment":"..."}
//     -> 200 or 201, application/json
//        {"record":"2/2/...","action":"issued","ticket":BASE64,"event":SHA-256 in hexadecimal,...}
//     -> another status, application/problem+json (RFC 9457); "detail" is shown to the user
//
// The service is not believed: a ticket is judged as one that was fetched, and must list every hash that was
// asked for.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/url.h"
#include "retrieval/cancellation.h"
#include "retrieval/connection.h"
#include "retrieval/retry_policy.h"
#include "retrieval/ticket_fetch.h"
#include "src/code_hashes.h"
#include "src/platform.h"

namespace pinwell::retrieval {

/// One artefact that a ticket is wanted for.
struct TicketWish {
    std::vector<CodeHash> hashes;  // that the ticket is to list, the artefact's own first; never empty
    std::string label;             // what it is, for people; in UTF-8
    bool reinstates = false;       // even if the record is revoked
    std::string comment{};         // for the service's log; in UTF-8
};

struct RequestOptions {
    foundation::URL service;  // "https://HOST:PORT", maybe with a path in front of the listener's
    RetryPolicy retry;

    /// When all must be over; what is not, is timedOut.
    std::optional<Clock::time_point> deadline;
};

struct RequestedTicket {
    /// The ticket and its judgement. Refusals of the service are notIssued, one about a revoked record is
    /// revoked.
    FetchedTicket fetched;

    /// What the service did, as its log has it; empty without a ticket.
    std::string action;  // "issued", "reissued" or "reinstated"
    std::string event;   // the hash of the log's entry, in hexadecimal
};

/// The URL that tickets are asked for at. `nullopt` if the text is no https URL, names a user, or has a query
/// or a fragment.
std::optional<foundation::URL> serviceURLOf(std::string_view text);

/// For one thread.
class TicketRequests {
  public:
    /// The platform's sessions are those that show the client's certificate; they must not follow redirects.
    TicketRequests(const Platform& platform, RequestOptions options, Cancellation& cancellation);

    /// Blocks, and tries again what another try may cure: lost connections, 429, 502, 503 and 504. The tries
    /// for one wish have one Idempotency-Key, so that the service carries it out once. No two wishes have
    /// the same key, in this process or another. After a service that was not reached with all tries, or not
    /// trusted, later wishes end so without being asked for.
    RequestedTicket request(const TicketWish& wish);

    /// Why no wish is asked for any more: timedOut or interrupted. `nullopt` if the time is not up.
    std::optional<Cause> end() const;

  private:
    enum class Try : std::uint8_t { isDone, mayBeRepeated };
    Try attempt(const TicketWish& wish, const https::Request& request, RequestedTicket& result,
                std::optional<std::chrono::seconds>& retryAfter);
    Try takeResponse(const TicketWish& wish, const Exchange& exchange, RequestedTicket& result,
                     std::optional<std::chrono::seconds>& retryAfter);
    void takeIssued(const TicketWish& wish, const Exchange& exchange, RequestedTicket& result) const;
    bool hasEnded(FetchedTicket& result) const;

    const Platform platform_;
    const RequestOptions options_;
    Cancellation& cancellation_;
    Connection connection_;
    Cancellation::Use use_;
    std::optional<FetchedTicket> lost_;  // what was said of the service when it was given up
};

}  // namespace pinwell::retrieval
