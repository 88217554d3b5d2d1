// The page hashes of code directories: every byte of the signed code, read once for all directories and
// shared among threads.
#pragma once

#include <string>

#include "codesign/byte_source.h"
#include "codesign/executable_image.h"
#include "verify/signature_parts.h"
#include "verify/workers.h"

namespace pinwell::verify {

/// Holds `code`, a range of `source`, against the hashes of all directories. Memory: one buffer a thread.
/// Adds one check a directory, and one more for each page that differs. A range that cannot be read any more
/// is `unreadable`.
///
/// Asked before: every directory's limit is the length of `code` (checkCodeLimit). A directory whose limit is
/// another is left out.
void checkPageHashes(const codesign::ByteSource& source, const codesign::FileRange& code,
                     const SignatureParts& parts, const std::string& place, Workers& workers,
                     Section& section);

/// Whether the hashes of every directory cover exactly `codeLength` bytes, in the number of slots that they
/// take. `what` names what stands there: "the signature".
void checkCodeLimit(const SignatureParts& parts, std::uint64_t codeLength, const std::string& what,
                    const std::string& place, Section& section);

}  // namespace pinwell::verify
