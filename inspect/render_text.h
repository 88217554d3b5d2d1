// A report as a page for people.
#pragma once

#include <string>

#include "inspect/report.h"

namespace pinwell::inspect {

/// Entries, certificates and table rows that are shown; a line counts the rest.
inline constexpr std::size_t kMaximumRowsShown = 16;

/// Several lines, the last one ended. Whatever came from a file is escaped; `colour` adds terminal colours
/// and changes no text.
std::string renderText(const Report& report, bool colour);

}  // namespace pinwell::inspect
