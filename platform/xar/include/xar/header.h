// The fixed part of an archive.
//
// | Offset    | Size | Field                                                     |
// |-----------|------|-----------------------------------------------------------|
// | 0         | 4    | "xar!"                                                    |
// | 4         | 2    | size of the header, at least 28; more bytes are skipped   |
// | 6         | 2    | version, ignored                                          |
// | 8         | 8    | compressed length of the table of contents                |
// | 16        | 8    | its uncompressed length, ignored                          |
// | 24        | 4    | checksum algorithm: 0 none, 1 SHA-1, 2 MD5, 3 by name     |
// | 28        |      | the algorithm's name, zero-padded, if the number is 3     |
// | size      |      | the table of contents, a zlib stream                      |
// | after it  |      | the heap; the table's offsets count from its start        |
//
// Big-endian. A header with a name is at least 32 bytes and a multiple of 4. In headers of exactly 28 bytes,
// which have no name, 3 means SHA-256 and 4 means SHA-512.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

#include "base/bytes.h"
#include "crypto/crypto.h"

namespace pinwell::xar {

using Digest = crypto::Digest;

/// The digest by its name in lower case. Returns `nullopt` for any other spelling: otherwise readers that
/// compare case would differ from readers that do not.
std::optional<Digest> digestNamed(std::string_view name);

/// The length of the fields that every header has.
inline constexpr std::size_t kFixedHeaderSize = 28;

/// Longest part of a header that is read: the fixed fields and a name.
inline constexpr std::size_t kLongestHeaderRead = kFixedHeaderSize + 64;

struct Header {
    std::uint16_t size = 0;
    std::uint64_t compressedLength = 0;
    std::optional<Digest> digest;  // of the checksum; `nullopt`: there is none
};

/// The header at the start of `bytes`, which are at most the file's first kLongestHeaderRead bytes. Returns
/// `nullopt` if there is none.
std::optional<Header> parseHeader(base::ByteView bytes);

}  // namespace pinwell::xar
