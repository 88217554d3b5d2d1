// The code-signature superblob of a disk image, taken apart into its blobs and put together again. All
// integers are big-endian; offsets count from the superblob's start.
//
// | Offset         | Size      | Field                                                              |
// |----------------|-----------|--------------------------------------------------------------------|
// | 0              | 4         | magic FADE0CC0                                                     |
// | 4              | 4         | length of the whole, this header included                          |
// | 8              | 4         | count of index entries                                             |
// | 12             | 8 x count | index: slot type (4), offset of the blob (4)                       |
// | 12 + 8 x count | rest      | blobs: magic (4), length with these 8 bytes (4), payload           |
//
// Stricter than what the code-signing service reads, since the parts are to be written back: the blobs follow
// the index at once, in index order, back to back, and the last one ends where the superblob ends. Refused
// besides: two equal index entries. No blob is looked into. There is no limit on the length or on the number
// of blobs: a record is a view, and takes no more than twice what the smallest blob and its index entry do.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

#include "foundation/bytes.h"
#include "foundation/sparse_bytes.h"
#include "foundation/value.h"

namespace pinwell {

inline constexpr std::uint32_t kSuperblobMagic = 0xFADE0CC0;
inline constexpr std::uint32_t kSuperblobHeaderSize = 12;
inline constexpr std::uint32_t kBlobIndexEntrySize = 8;
inline constexpr std::uint32_t kBlobHeaderSize = 8;

/// The slot that a stapled ticket stands in, and the magic of its blob.
inline constexpr std::uint32_t kTicketSlotType = 0x10002;
inline constexpr std::uint32_t kTicketBlobMagic = 0xFADE0B01;

/// What a slot holds, in words; "unknown" for one that we do not know.
std::string_view slotName(std::uint32_t slot);

/// Keys of a blob record.
inline constexpr std::string_view kSlotTypeKey = "cs slot type";  // number, 32 bits
inline constexpr std::string_view kBlobOffsetKey = "offset";      // number, 32 bits
inline constexpr std::string_view kBlobLengthKey = "length";      // number: from the offsets
inline constexpr std::string_view kBlobDataKey = "data";          // byte buffer, with the blob's header
inline constexpr std::string_view kBlobMagicKey = "magic";        // number, 32 bits

/// One blob, as a view of its superblob. Reads as a dictionary of exactly the five keys above.
struct BlobRecord {
    std::uint32_t slotType = 0;
    std::uint32_t offset = 0;
    std::uint32_t magic = 0;
    foundation::ByteView data;  // with the blob's header

    std::uint64_t length() const noexcept { return data.size(); }

    /// The value of one of the five keys; null for any other.
    foundation::Value at(std::string_view key) const;

    /// Whether all keys have equal values.
    friend bool operator==(const BlobRecord& a, const BlobRecord& b);
};

/// Records in index order, no two of them equal.
using BlobSet = std::vector<BlobRecord>;

/// The blobs of a whole superblob that says it has `numberOfBlobs`, as views of it. Nothing when index
/// entries are missing or equal, or when the blobs do not fill the superblob; fewer records than
/// `numberOfBlobs` when a blob's own length is wrong and the others fill it all the same.
std::optional<BlobSet> orderedBlobSetForSuperBlob(foundation::ByteView superblob,
                                                  std::uint32_t numberOfBlobs);

/// What stands in for a missing signature: a header that counts no blobs.
foundation::Data emptySuperblob();

/// Whether the superblob of superblobWithTicket would have a length of 32 bits, which is all that its header
/// has room for.
bool hasRoomForTicket(const BlobSet& blobs, foundation::ByteView ticket);

/// The superblob of all of `blobs` that are no ticket, followed by `ticket` in a blob of its own unless it is
/// empty, and by `spare` zero bytes for what the caller puts behind it. Empty when that leaves no blob at
/// all. hasRoomForTicket must hold. Throws std::bad_alloc.
foundation::SparseBuffer superblobWithTicket(const BlobSet& blobs, foundation::ByteView ticket,
                                             std::size_t spare = 0);

}  // namespace pinwell
