// The time for all objects in the tests of the record service.
#pragma once

#include "values/date.h"

namespace pinwell::lumora {

inline constexpr values::Date kNow{1'795'000'000};

}  // namespace pinwell::lumora
