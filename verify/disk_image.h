// Deep verification of a disk image: its data, its trailer, and its block table as a second check.
#pragma once

#include <optional>

#include "codesign/byte_source.h"
#include "verify/executable.h"

namespace pinwell::verify {

/// `source` ends in a disk image's trailer. An unsigned image has no identity here: its synthetic hash covers
/// all of its data, so that hash is the whole check.
VerifiedCode verifyDiskImage(const codesign::ByteSource& source, Workers& workers, Section& section);

}  // namespace pinwell::verify
