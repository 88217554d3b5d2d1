// The artefacts of a directory tree.
#pragma once

#include <string>
#include <vector>

#include "src/platform.h"

namespace pinwell::gate {

/// How deep a tree is walked, and how many entries of it. Beyond it the tree is refused.
inline constexpr unsigned kMaximumTreeDepth = 128;
inline constexpr std::size_t kMaximumTreeEntries = 10'000'000;

struct FoundArtefacts {
    std::vector<std::string> paths;
    std::string problem;  // why not all of them were found; empty when they were
};

/// All disk images, packages, bundles and executable images at or below `path`, in byte order of their paths.
/// A bundle is one artefact: what is in it is not looked for. `path` may be a symbolic link to a directory;
/// links below it are not followed.
FoundArtefacts findArtefacts(const std::string& path, const Platform& platform);

}  // namespace pinwell::gate
