// The sample artefacts, one of every kind that can have a ticket.
#pragma once

#include <string>
#include <vector>

#include "foundation/date.h"

namespace pinwell::lumora {

/// Writes these into `directory`, which is made if it is missing, and returns their paths in this
/// order:
///
///   Sample.app     an application (sample_bundle.h)
///   Sample.dmg     a disk image with a code signature (sample_disk_image.h)
///   Unsigned.dmg   the same image without one
///   Sample.pkg     a signed flat package (sample_package.h), signed at `now`
///
/// Overwrites nothing. If one of them exists or cannot be written, no new file remains. Throws
/// Failure.
std::vector<std::string> writeSamples(const std::string& directory, foundation::Date now);

}  // namespace pinwell::lumora
