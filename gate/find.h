// The artefacts of a directory tree.
#pragma once

#include <string>
#include <vector>

#include "src/platform.h"

namespace pinwell::gate {

/// The maximum depth and number of entries of a tree. A larger tree is refused.
inline constexpr unsigned kMaximumTreeDepth = 128;
inline constexpr std::size_t kMaximumTreeEntries = 10'000'000;

struct FoundArtefacts {
    std::vector<std::string> paths;
    std::string problem;  // why some were not found; empty if all were
};

/// All disk images, packages, bundles and executable images at or below `path`, in byte order of their paths.
/// A bundle is one artefact: its contents are not searched. `path` may be a symbolic link to a directory;
/// links below it are not followed.
FoundArtefacts findArtefacts(const std::string& path, const Platform& platform);

}  // namespace pinwell::gate
