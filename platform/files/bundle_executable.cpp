#include "files/bundle_executable.h"

#include "foundation/bundle.h"

namespace pinwell::files {

std::optional<URL> mainExecutableIn(foundation::Places& places, const URL& directory) {
    const auto path = foundation::mainExecutableOfBundle(places, directory.path());
    if (!path) return std::nullopt;
    return URL::fileURLWithPath(*path);
}

}  // namespace pinwell::files
