// The page for people (page.h) on the administration listener.
//
//   GET /                   the search form, and the number of records and events
//   GET /records            a page of records: by, text, environment, after
//   GET /records/NAME       a record and a page of its history: environment, after
//   GET /style.css
#pragma once

#include "lumora-local/admin_service.h"
#include "lumora-local/record_store.h"

namespace pinwell::lumora {

/// Each needs the role `read`. `store` must outlive the routes.
AdminRoutes pageRoutes(RecordStore& store);

}  // namespace pinwell::lumora
