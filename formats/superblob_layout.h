// The layout of a superblob, the container of a code signature. All integers are big-endian; offsets count
// from its start.
//
// | Offset | Size      | Field                                                                       |
// |--------|-----------|-----------------------------------------------------------------------------|
// | 0      | 4         | magic FADE0CC0                                                              |
// | 4      | 4         | length of the whole, with this header                                       |
// | 8      | 4         | count of index entries                                                      |
// | 12     | 8 x count | index: slot (4), offset of the blob (4)                                     |
// | any    |           | blobs: magic (4), length with these 8 bytes (4), payload                    |
//
// Only the fields are read here, without a rule. Two readers have rules on top: the code-signing service
// accepts gaps and any order (platform/codesign/superblob.h), a disk image that is written again does not
// (src/PWHashedFile/blob_set.h).
#pragma once

#include <compare>
#include <cstdint>

#include "foundation/byte_reader.h"

namespace pinwell {

inline constexpr std::uint32_t kSuperblobMagic = 0xFADE0CC0;
inline constexpr std::uint32_t kSuperblobHeaderSize = 12;
inline constexpr std::uint32_t kBlobIndexEntrySize = 8;
inline constexpr std::uint32_t kBlobHeaderSize = 8;

/// The magic of a blob around bytes that are not a blob themselves: the signer's message, and a ticket.
inline constexpr std::uint32_t kWrapperMagic = 0xFADE0B01;

struct SuperblobHeader {
    std::uint32_t magic = 0;
    std::uint32_t length = 0;
    std::uint32_t count = 0;
};

struct BlobIndexEntry {
    std::uint32_t slot = 0;
    std::uint32_t offset = 0;

    auto operator<=>(const BlobIndexEntry&) const = default;
};

struct BlobHeader {
    std::uint32_t magic = 0;
    std::uint32_t length = 0;
};

// Each reads at the reader's position, and throws foundation::ShortRead, which names the field.
SuperblobHeader readSuperblobHeader(foundation::ByteReader& reader);
BlobIndexEntry readBlobIndexEntry(foundation::ByteReader& reader);
BlobHeader readBlobHeader(foundation::ByteReader& reader);

}  // namespace pinwell
