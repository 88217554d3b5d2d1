// The page hashes of code directories: every byte of the signed code, read once for all directories and
// shared among threads.
#pragma once

#include <string>

#include "base/byte_source.h"
#include "codesign/executable_image.h"
#include "verify/signature_parts.h"
#include "verify/workers.h"

namespace pinwell::verify {

/// Checks `code`, a range of `source`, against the hashes of all directories. Memory: one buffer for each
/// thread. Adds one check for each directory, and one for each page that differs. If the range can no longer
/// be read, the outcome is `unreadable`.
///
/// Call checkCodeLimit first: every directory's limit must be the length of `code`. A directory with another
/// limit is skipped.
void checkPageHashes(const base::ByteSource& source, const codesign::FileRange& code,
                     const SignatureParts& parts, const std::string& place, Workers& workers,
                     Section& section);

/// Checks that the hashes of every directory cover exactly `codeLength` bytes, with the right number of
/// slots. `what` names the next part: "the signature".
void checkCodeLimit(const SignatureParts& parts, std::uint64_t codeLength, const std::string& what,
                    const std::string& place, Section& section);

}  // namespace pinwell::verify
