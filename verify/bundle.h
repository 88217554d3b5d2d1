// Deep verification of a bundle: its main executable, the seal of its resources, every file in it, and the
// code nested in it.
//
// What is in a bundle and by what it is covered:
//
// | In the root of the seal             | Covered by                                                        |
// |-------------------------------------|-------------------------------------------------------------------|
// | the main executable                 | its own signature                                                 |
// | the property list                   | special slot 1                                                    |
// | _CodeSignature/CodeResources        | special slot 3                                                    |
// | the rest of _CodeSignature          | nothing; only files of known names may be there                   |
// | CodeResources (not in a framework)  | it is the ticket, which has a signature of its own                |
// | CodeResources, a link               | nothing; it leads to _CodeSignature/CodeResources                 |
// | a path that the seal lists          | the seal: a digest, a target, or a hash of nested code            |
// | a path that a rule lets out         | nothing, as the signer wanted                                     |
// | any other                           | a fault                                                           |
//
// Outside of that root a bundle has nothing; a framework has links of its own that say what its current
// version is. Nested code is verified as a bundle or an image is, with a section of its own.
#pragma once

#include <string>

#include "verify/check.h"
#include "verify/executable.h"

namespace pinwell::verify {

/// How deep, and over how many directory entries, a bundle is walked, nested bundles included.
inline constexpr unsigned kMaximumWalkDepth = 64;
inline constexpr std::size_t kMaximumWalkEntries = 1'000'000;

/// Throws codesign::CodeError if the directory has no main executable, or if it cannot be read.
VerifiedCode verifyBundle(const std::string& path, Workers& workers, Section& section);

}  // namespace pinwell::verify
