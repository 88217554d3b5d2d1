// The command line of pinwell-batch.
#pragma once

#include <optional>

#include "batch/settings.h"

namespace pinwell::batch {

inline constexpr const char* kProgramName = "pinwell-batch";

/// Fills in the settings. Returns the exit status if the process must end: the help or an error was
/// printed.
std::optional<int> readCommandLine(int argc, char** argv, Settings& settings);

}  // namespace pinwell::batch
