// The bytes after a package's archive (src/PWHashedFile/package_trailer.h), as deep verification requires
// them: none, or a terminator and one ticket.
//
// The tool skips trailers of other types and keeps them. Here they are faults, because nothing covers them. A
// second ticket, a chain without its terminator, and records with non-zero unused bytes are faults too.
#pragma once

#include <cstdint>

#include "codesign/byte_source.h"
#include "verify/check.h"

namespace pinwell::verify {

/// The end of the archive, where the trailers begin, in bytes from the start. Adds a check for each fault.
/// Throws codesign::CodeError if the bytes cannot be read.
std::uint64_t endOfArchive(const codesign::ByteSource& source, Section& section);

}  // namespace pinwell::verify
