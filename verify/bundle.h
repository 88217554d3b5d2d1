// Deep verification of a bundle: its main executable, the seal of its resources, every file in it, and the
// code nested in it.
//
// The contents of a bundle, and what covers each:
//
// | In the root of the seal             | Covered by                                                        |
// |-------------------------------------|-------------------------------------------------------------------|
// | the main executable                 | its own signature                                                 |
// | the property list                   | special slot 1                                                    |
// | _CodeSignature/CodeResources        | special slot 3                                                    |
// | the rest of _CodeSignature          | nothing; only files of known names are allowed                    |
// | CodeResources (not in a framework)  | it is the ticket, which has a signature of its own                |
// | CodeResources, a link               | nothing; it leads to _CodeSignature/CodeResources                 |
// | a path that the seal lists          | the seal: a digest, a target, or a hash of nested code            |
// | a path that a rule exempts          | nothing, as the signer chose                                      |
// | any other                           | a fault                                                           |
//
// Outside of that root a bundle has nothing, except the links of a framework that name its current version.
// Nested code is verified like a bundle or an image, with its own section.
#pragma once

#include <string>

#include "verify/check.h"
#include "verify/executable.h"

namespace pinwell::verify {

/// Maximum depth and number of directory entries of a bundle, with its nested bundles.
inline constexpr unsigned kMaximumWalkDepth = 64;
inline constexpr std::size_t kMaximumWalkEntries = 1'000'000;

/// Throws codesign::CodeError if the directory has no main executable, or if it cannot be read.
VerifiedCode verifyBundle(const std::string& path, Workers& workers, Section& section);

}  // namespace pinwell::verify
