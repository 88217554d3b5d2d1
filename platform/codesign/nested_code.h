// The signed code inside a bundle: nested bundles, frameworks, plug-ins, helpers, libraries and programs.
#pragma once

#include <string>
#include <vector>

#include "codesign/code_signature.h"
#include "codesign/static_code.h"

namespace pinwell::codesign {

/// Maximum depth and number of directory entries of a walk. The largest real bundles have some 100000 files,
/// and a framework in a plug-in in an application is some 20 directories deep.
inline constexpr unsigned kMaximumBundleDepth = 64;
inline constexpr std::size_t kMaximumBundleEntries = 1'000'000;

/// The valid signatures of all code below the directory `bundlePath`, also of its own main executable
/// if that is an executable image. Executable images are recognised by their first bytes, in any
/// place; a nested bundle in the separate form by its Contents/_CodeSignature/CodeDirectory. Files are
/// visited in byte order of their names. Links are not followed, and moving items during the walk
/// never leads outside the directory. Code that is unreadable, unsigned or invalid is skipped. Throws
/// CodeError (kUnimplemented) for a bundle beyond the limits, because a partial list would look
/// complete.
std::vector<CodeSignature> findNestedSignatures(const std::string& bundlePath, const CodeAccess& access);

}  // namespace pinwell::codesign
