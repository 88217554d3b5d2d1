// The results of a run as text for a person, and as documents for programs.
#pragma once

#include <string>
#include <vector>

#include "gate/result.h"

namespace pinwell::gate {

/// The conclusion first, then only what failed or has to be known.
std::string renderText(const std::vector<Result>& results);

/// docs/gate.schema.json.
std::string renderJson(const std::vector<Result>& results);

}  // namespace pinwell::gate
