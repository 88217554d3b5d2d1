#include "pinwell_vers.h"

namespace pinwell {

// Kept in the executable although nothing refers to it: what(1) searches for "@(#)".
[[gnu::used]] const char pinwellVersionString[] = "@(#)PROGRAM:pinwell  PROJECT:pinwell-34\n";
[[gnu::used]] const double pinwellVersionNumber = 34.0;

}  // namespace pinwell
