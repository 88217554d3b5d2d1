// Deep verification of a bundle: its main executable, the seal of its resources, every file in it, and the
// code nested in it.
#pragma once

#include <string>

#include "verify/check.h"
#include "verify/executable.h"

namespace pinwell::verify {

/// Throws codesign::CodeError if the directory has no main executable or cannot be read.
VerifiedCode verifyBundle(const std::string& path, Workers& workers, Section& section);

}  // namespace pinwell::verify
