// A report as a page for people.
#pragma once

#include <string>

#include "report.h"

namespace pinwell::inspect {

/// Maximum number of entries, certificates and table rows shown; a line counts the rest.
inline constexpr std::size_t kMaximumRowsShown = 16;

/// Several lines, each with a line end. Texts from a file are escaped; `colour` adds terminal colours and
/// changes no text.
std::string renderText(const Report& report, bool colour);

}  // namespace pinwell::inspect
