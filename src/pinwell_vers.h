// The version of the tool, for what(1) and for debuggers; no run prints it.
#pragma once

namespace pinwell {

extern const char pinwellVersionString[];
extern const double pinwellVersionNumber;

}  // namespace pinwell
