// The requests on the administration listener: those of docs/service/openapi.json, and the page for people
// (page.h).
//
//   POST /v1/tickets, /v1/revocations    JSON bodies; they issue and revoke
//   GET  /v1/records, /v1/events         a page of records or events, as JSON
//   GET  /                               the search form, and the number of records and events
//   GET  /records                        a page of records: by, text, environment, after
//   GET  /records/NAME                   a record and a page of its history: environment, after
//   GET  /style.css
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <string_view>

#include "admin_service.h"
#include "commands.h"
#include "record_store.h"
#include "ticket_maker.h"

namespace pinwell::lumora {

inline constexpr std::size_t kMaximumListedHashes = 8192;
inline constexpr std::size_t kMaximumLabelBytes = 1024;
inline constexpr std::size_t kMaximumCommentBytes = 4096;

struct TicketRequest {
    Environment environment = Environment::production;
    DescribedArtefact artefact;
    bool reinstates = false;
    std::string comment;
};

struct RevocationRequest {
    Environment environment = Environment::production;
    std::string record;
    Reason reason = Reason::unspecified;
    std::string comment;
};

/// Both throw Refused: 400 if the text is not a JSON object, 422 if a member is missing, unknown, of another
/// type or out of its bounds.
TicketRequest parseTicketRequest(std::string_view body);
RevocationRequest parseRevocationRequest(std::string_view body);

/// The record and the set that a body names, as far as they can be read; for the log.
RefusedAttempt attemptIn(std::string_view body);

/// The key in the header Idempotency-Key, without its quotes. Throws Refused (400) if it is not a key.
std::string parseIdempotencyKey(std::string_view header);

/// The number of records or events on a page.
inline constexpr std::size_t kDefaultPage = 50;
inline constexpr std::size_t kMaximumPage = 100;

/// Returns the signer that is in use now. From any thread.
using SignerInUse = std::function<std::shared_ptr<const TicketSigner>()>;

/// POST /v1/tickets, POST /v1/revocations. `store` must outlive the routes.
AdminRoutes changingRoutes(RecordStore& store, const SignerInUse& signer);

/// GET /v1/records, GET /v1/events. `store` must outlive the routes.
AdminRoutes readingRoutes(RecordStore& store);

/// GET /, /records, /style.css. Each needs the role `read`. `store` must outlive the routes.
AdminRoutes pageRoutes(RecordStore& store);

/// The search of GET /v1/records and of GET /v1/events, from the query. Both throw Refused (400).
RecordSearch recordSearchOf(const Query& query);
EventSearch eventSearchOf(const Query& query);

/// The beginning of a page, as text for a query.
std::string toString(const RecordCursor& cursor);
std::string toString(const EventCursor& cursor);

}  // namespace pinwell::lumora
