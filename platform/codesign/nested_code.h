// The signed code inside a bundle: nested bundles, frameworks, plug-ins, helpers, libraries and programs.
#pragma once

#include <string>
#include <vector>

#include "codesign/code_signature.h"
#include "codesign/static_code.h"

namespace pinwell::codesign {

/// How deep, and over how many directory entries, a bundle is walked. The largest bundles in use hold some
/// 100000 files, and a framework in a plug-in in an application is some 20 directories deep.
inline constexpr unsigned kMaximumBundleDepth = 64;
inline constexpr std::size_t kMaximumBundleEntries = 1'000'000;

/// The valid signatures of all code below the directory `bundlePath`, its own main executable included
/// wherever it is an executable image. Executable images are known by their first bytes, wherever they lie; a
/// nested bundle in the separate form by its Contents/_CodeSignature/CodeDirectory. Files are visited in byte
/// order of their names. Links are not followed, and nothing outside the directory is
/// reached by what is moved about meanwhile; code that cannot be read, is not signed or is not valid is
/// passed over. Throws CodeError (kUnimplemented) for a bundle beyond the limits: part of a list would pass
/// for all of it.
std::vector<CodeSignature> findNestedSignatures(const std::string& bundlePath, const CodeAccess& access);

}  // namespace pinwell::codesign
