// The command line of pinwell-batch.
#pragma once

#include <optional>

#include "batch/settings.h"

namespace pinwell::batch {

inline constexpr const char* kProgramName = "pinwell-batch";

/// Fills in the settings. Returns the exit status if the process is to end: the help was printed, or what is
/// wrong with the line.
std::optional<int> readCommandLine(int argc, char** argv, Settings& settings);

}  // namespace pinwell::batch
