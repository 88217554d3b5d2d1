// A disk image's own checksums: a second check of its data, besides the hashes of its signature. All integers
// are big-endian; a sector is 512 bytes.
//
// The trailer (formats/disk_image.h) gives the place of the data fork, with a checksum of its
// bytes, and the place of a property list. The list's resource-fork/blkx holds the tables:
//
// | Offset | Size | Field of a table                                                                |
// |--------|------|---------------------------------------------------------------------------------|
// | 0      | 4    | "mish"                                                                          |
// | 4      | 12   | version (4), first sector (8)                                                   |
// | 16     | 8    | count of sectors                                                                |
// | 24     | 40   | offset that blocks count from in the data fork (8), and more                    |
// | 64     | 136  | checksum of the unpacked sectors: type (4), bits (4), value (128)               |
// | 200    | 4    | count of blocks                                                                 |
// | 204    | 40 x | blocks: type (4), comment (4), first sector, count of sectors, offset, length   |
//
// | Type       | Block                                                                                     |
// |------------|-------------------------------------------------------------------------------------------|
// | 0, 2       | zeros                                                                                     |
// | 1          | as they are                                                                               |
// | 80000005   | a zlib stream                                                                             |
// | 7FFFFFFE   | a comment                                                                                 |
// | FFFFFFFF   | the end                                                                                   |
// | any other  | an unsupported packing: the table is skipped                                              |
//
// Checksums of type 2 with 32 bits are CRC-32; others are skipped. The master checksum covers the tables'
// values, one after the other. A skipped table or checksum is reported with its reason. Only a wrong
// checksum, or a table that contradicts itself, is a fault.
#pragma once

#include "codesign/static_code.h"
#include "verify/check.h"
#include "verify/workers.h"

namespace pinwell::verify {

/// A larger image, in packed or unpacked bytes, gets no second check: its hashes cover every byte.
inline constexpr std::uint64_t kMaximumUnpacked = std::uint64_t{256} * 1024 * 1024;

/// Blocks of all tables. An image of kMaximumUnpacked has about a thousand.
inline constexpr std::size_t kMaximumBlocks = 16'384;

/// Adds a check for each checksum. Memory: the property list, and one buffer for each thread. Throws
/// codesign::CodeError if the bytes cannot be read.
void checkBlockTables(const base::ByteSource& source, const codesign::DiskImageTrailer& trailer,
                      Workers& workers, Section& section);

}  // namespace pinwell::verify
