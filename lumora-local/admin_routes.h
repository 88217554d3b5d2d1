// The requests of docs/service/openapi.json.
#pragma once

#include <functional>
#include <memory>

#include "lumora-local/admin_service.h"
#include "lumora-local/record_store.h"
#include "lumora-local/ticket_maker.h"

namespace pinwell::lumora {

/// The number of records or events on a page.
inline constexpr std::size_t kDefaultPage = 50;
inline constexpr std::size_t kMaximumPage = 100;

/// Returns the signer that is in use now. From any thread.
using SignerInUse = std::function<std::shared_ptr<const TicketSigner>()>;

/// POST /v1/tickets, POST /v1/revocations. `store` must outlive the routes.
AdminRoutes changingRoutes(RecordStore& store, const SignerInUse& signer);

/// GET /v1/records, GET /v1/events. `store` must outlive the routes.
AdminRoutes readingRoutes(RecordStore& store);

/// The search of GET /v1/records and of GET /v1/events, from the query. Both throw Refused (400).
RecordSearch recordSearchOf(const Query& query);
EventSearch eventSearchOf(const Query& query);

/// The beginning of a page, as text for a query.
std::string toString(const RecordCursor& cursor);
std::string toString(const EventCursor& cursor);

}  // namespace pinwell::lumora
