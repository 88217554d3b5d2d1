// A cdhash for a disk image without a signature.
//
// The code-signing service signs the whole file ad hoc, as opaque data, into memory; the cdhash of that
// signature is the image's. The same bytes always give the same cdhash, so a ticket for it can be issued,
// found and checked.
#pragma once

#include <cstdint>
#include <optional>

#include "foundation/bytes.h"
#include "foundation/url.h"
#include "src/platform.h"

namespace pinwell {

/// Writes the digest type and the cdhash of `fileURL` to the out-parameters that are not null; returns the
/// platform's parameter error if both are null. Returns the status of the failed operation, or success. If
/// the signature has no cdhash, it returns success and leaves the out-parameters unchanged. Reads the whole
/// file, and never changes it.
codesign::Status syntheticCDHashForURL(const foundation::URL& fileURL, const Platform& platform,
                                       std::uint32_t* digestAlgorithm,
                                       std::optional<foundation::Data>* cdHash);

}  // namespace pinwell
