// Deep verification of a flat package: table of contents, signature, and everything in the heap.
#pragma once

#include "codesign/byte_source.h"
#include "verify/executable.h"

namespace pinwell::verify {

VerifiedCode verifyPackage(const codesign::ByteSource& source, Workers& workers, Section& section);

}  // namespace pinwell::verify
