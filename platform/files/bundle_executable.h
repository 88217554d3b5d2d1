// The main executable of a bundle. For this folder only.
#pragma once

#include <optional>

#include "files/file_manager.h"

namespace pinwell::files {

std::optional<URL> mainExecutableIn(foundation::Places& places, const URL& directory);

}  // namespace pinwell::files
