// The time for all objects in the tests of the record service.
#pragma once

#include "foundation/date.h"

namespace pinwell::lumora {

inline constexpr foundation::Date kNow{1'795'000'000};

}  // namespace pinwell::lumora
