// zlib streams (RFC 1950) and their checksum's sister CRC-32 (ISO 3309), for the samples.
#pragma once

#include <cstdint>

#include "foundation/bytes.h"

namespace pinwell::lumora {

/// Throws Failure when the library fails.
foundation::Data deflated(foundation::ByteView contents);

std::uint32_t crc32(foundation::ByteView bytes);

}  // namespace pinwell::lumora
