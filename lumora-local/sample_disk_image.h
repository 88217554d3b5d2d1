// Disk images to try the service with, which other readers of the format accept too.
//
// | Part           | Holds                                                                            |
// |----------------|----------------------------------------------------------------------------------|
// | data fork      | the chunks of a small volume (sample_volume.h), deflated                         |
// | property list  | "resource-fork" with one "blkx" block table, which says what each chunk holds    |
// | code signature | superblob (ad_hoc_signature.h) that covers all before it; absent when unsigned   |
// | trailer        | 512 bytes: where the other parts are, and their CRC-32 (ISO 3309)                |
//
// Block table. All integers here and in the trailer are big-endian.
//
// | Offset | Size | Field                                                                            |
// |--------|------|----------------------------------------------------------------------------------|
// | 0      | 4    | "mish"                                                                           |
// | 4      | 4    | version, 1                                                                       |
// | 8      | 16   | first sector and number of sectors of the volume                                 |
// | 24     | 8    | added to the chunks' offsets: 0                                                  |
// | 32     | 4    | sectors to set aside for decompressing one chunk                                 |
// | 36     | 4    | number of the table                                                              |
// | 40     | 24   | reserved                                                                         |
// | 64     | 136  | checksum of the volume: type 2 (CRC-32), 32 bits, 128 bytes of room              |
// | 200    | 4    | number of chunks                                                                 |
// | 204    | 40 n | chunks: type and comment (4 each); first sector, sectors, offset and length in   |
// |        |      | the data fork (8 each). Types: 80000005 deflated, 2 nothing, FFFFFFFF the end    |
#pragma once

#include <string>

#include "foundation/bytes.h"

namespace pinwell::lumora {

enum class ImageSignature { none, adHoc };

/// A whole image, always the same.
foundation::Data makeDiskImage(ImageSignature signature);

/// Writes `directory`/`name` and returns its path. Overwrites nothing. Throws Failure.
std::string writeSampleDiskImage(const std::string& directory, const std::string& name,
                                 ImageSignature signature);

}  // namespace pinwell::lumora
