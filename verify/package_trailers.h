// What is behind a package's archive (src/PWHashedFile/package_trailer.h), as deep verification asks for it:
// nothing, or a terminator and one ticket.
//
// The tool passes over trailers of other types and keeps them. Here they are faults, since nothing covers
// them; so are a second ticket, a chain without its terminator, and records whose unused bytes are not zero.
#pragma once

#include <cstdint>

#include "codesign/byte_source.h"
#include "verify/check.h"

namespace pinwell::verify {

/// Where the archive ends and the trailers begin, in bytes from the start. Adds a check for each fault.
/// Throws codesign::CodeError if the bytes cannot be read.
std::uint64_t endOfArchive(const codesign::ByteSource& source, Section& section);

}  // namespace pinwell::verify
