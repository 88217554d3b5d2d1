// A report as one JSON object on one line, for programs. docs/inspect.schema.json describes it.
#pragma once

#include <string>

#include "inspect/report.h"

namespace pinwell::inspect {

/// Goes up when a member changes its meaning or goes away; members may be added without.
inline constexpr int kJsonVersion = 1;

/// Every member is always there, null where there is nothing to say. Bytes are lower-case hexadecimal, times
/// are seconds since 1970-01-01 UTC. Lists are complete up to the limits of report.h, and a count beside them
/// says how long they are. What is not UTF-8 in a text from a file is replaced by U+FFFD.
std::string renderJson(const Report& report);

}  // namespace pinwell::inspect
