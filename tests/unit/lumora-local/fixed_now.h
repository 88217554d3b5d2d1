// The time at which the tests of the record service make what they look at.
#pragma once

#include "foundation/date.h"

namespace pinwell::lumora {

inline constexpr foundation::Date kNow{1'795'000'000};

}  // namespace pinwell::lumora
