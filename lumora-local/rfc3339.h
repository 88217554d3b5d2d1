// Points in time as RFC 3339 writes them.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "values/date.h"

namespace pinwell::lumora {

/// "2026-11-20T19:55:00Z"
std::string toRfc3339(values::Date date);

/// A date-time of RFC 3339 (section 5.6) with any offset, or a full-date, which is its first second in UTC. A
/// fraction of a second is cut off. `nullopt` for any other text, and for dates that the calendar does not
/// have.
std::optional<values::Date> parseRfc3339(std::string_view text);

}  // namespace pinwell::lumora
