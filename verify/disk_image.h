// Deep verification of a disk image: its data, its trailer, and its block table as a second opinion.
#pragma once

#include <optional>

#include "codesign/byte_source.h"
#include "verify/executable.h"

namespace pinwell::verify {

/// `source` ends in a disk image's trailer. An image without a signature of its own has no identity here:
/// its made-up hash covers all of its data, so that hash is the whole check.
VerifiedCode verifyDiskImage(const codesign::ByteSource& source, Workers& workers, Section& section);

}  // namespace pinwell::verify
