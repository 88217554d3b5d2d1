// A report as one JSON object on one line, for programs. docs/inspect.schema.json describes it.
#pragma once

#include <string>

#include "report.h"

namespace pinwell::inspect {

/// Increases if a member changes its meaning or is removed; added members do not change it.
inline constexpr int kJsonVersion = 1;

/// Every member is always present, null if it has no value. Bytes are lower-case hexadecimal, times are
/// seconds since 1970-01-01 UTC. Lists are complete up to the limits of report.h, and a count beside a list
/// gives its full length. Bytes outside UTF-8 in a text from a file are replaced by U+FFFD.
std::string renderJson(const Report& report);

}  // namespace pinwell::inspect
