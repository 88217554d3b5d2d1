// What version of the tool this is, for what(1) and for debuggers; nothing in a run prints it.
#pragma once

namespace pinwell {

extern const char pinwellVersionString[];
extern const double pinwellVersionNumber;

}  // namespace pinwell
