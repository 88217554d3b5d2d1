// The fixed part of an archive. For this folder only.
//
// | Offset    | Size | Field                                                     |
// |-----------|------|-----------------------------------------------------------|
// | 0         | 4    | "xar!"                                                    |
// | 4         | 2    | size of the header, at least 28; what it adds is skipped  |
// | 6         | 2    | version, not looked at                                    |
// | 8         | 8    | compressed length of the table of contents                |
// | 16        | 8    | its uncompressed length, not looked at                    |
// | 24        | 4    | checksum algorithm: 0 none, 1 SHA-1, 2 MD5, 3 by name     |
// | 28        |      | the algorithm's name, zero-padded, when it is 3           |
// | size      |      | the table of contents, a zlib stream                      |
// | behind it |      | the heap, which the table's offsets count from            |
//
// Big-endian. A header with a name is at least 32 bytes and a multiple of 4. In headers of exactly 28 bytes,
// which hold no name, 3 stands for SHA-256 and 4 for SHA-512.
#pragma once

#include <cstdint>
#include <optional>

#include "foundation/bytes.h"
#include "xar/digest.h"

namespace pinwell::xar {

/// The length of the fields that every header has.
inline constexpr std::size_t kFixedHeaderSize = 28;

/// As much of a header as is ever looked at: the fixed fields and a name.
inline constexpr std::size_t kLongestHeaderRead = kFixedHeaderSize + 64;

struct Header {
    std::uint16_t size = 0;
    std::uint64_t compressedLength = 0;
    DigestAlgorithm algorithm = DigestAlgorithm::none;
};

/// The header that `bytes`, the file's first kLongestHeaderRead at most, begin with. Returns `nullopt` if
/// they begin with none.
std::optional<Header> parseHeader(foundation::ByteView bytes);

}  // namespace pinwell::xar
