// A cdhash for a disk image that has no signature of its own.
//
// The code-signing service signs the whole file ad hoc, as opaque data, into memory; the cdhash of that
// signature is the image's. The same bytes always give the same one, so a ticket for it can be issued, found
// and checked.
#pragma once

#include <cstdint>
#include <optional>

#include "foundation/bytes.h"
#include "foundation/url.h"
#include "src/platform.h"

namespace pinwell {

/// Writes the digest type and the cdhash of `fileURL` to whichever of the two out-parameters is not null; the
/// platform's parameter error when both are. Answers the status of the operation that failed, else success,
/// and success also when the signature turned out to have no cdhash: the out-parameters then keep what they
/// held. Reads the whole file, and never changes it.
codesign::Status syntheticCDHashForURL(const foundation::URL& fileURL, const Platform& platform,
                                       std::uint32_t* digestAlgorithm,
                                       std::optional<foundation::Data>* cdHash);

}  // namespace pinwell
