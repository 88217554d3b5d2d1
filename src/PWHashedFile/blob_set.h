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
// besides: two equal index entries, and whatever exceeds the limits of the code-signing service
// (codesign/code_signing.h): a length is a claim of the file, with nothing behind it where the file is
// sparse, and a record takes fifty times what the smallest blob does. No blob is looked into.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

#include "foundation/bytes.h"
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

/// One blob: exactly the five keys above. Copies share the bytes.
using BlobRecord = foundation::Dictionary;

/// Records in index order, no two of them equal.
using BlobSet = std::vector<BlobRecord>;

std::uint32_t slotTypeOf(const BlobRecord& record);
std::uint32_t blobOffsetOf(const BlobRecord& record);
std::uint64_t lengthOf(const BlobRecord& record);
std::uint32_t blobMagicOf(const BlobRecord& record);
foundation::ByteView dataOf(const BlobRecord& record);

/// The blobs of a whole superblob that says it has `numberOfBlobs`. Nothing when index entries are missing or
/// equal, or when the blobs do not fill the superblob; fewer records than `numberOfBlobs` when a blob's own
/// length is wrong and the others fill it all the same.
std::optional<BlobSet> orderedBlobSetForSuperBlob(foundation::ByteView superblob,
                                                  std::uint32_t numberOfBlobs);

/// What stands in for a missing signature: a header that counts no blobs.
foundation::Data emptySuperblob();

/// The superblob of all of `blobs` that are no ticket, followed by `ticket` in a blob of its own unless it is
/// empty. Empty when that leaves no blob at all. `ticket` is shorter than 4 GiB.
foundation::Data superblobWithTicket(const BlobSet& blobs, foundation::ByteView ticket);

/// Whether a superblob made by superblobWithTicket keeps within the limits of those who read it: one more
/// blob, in an image at a limit, would be one too many for ever after.
bool isReadableSuperblob(foundation::ByteView superblob);

}  // namespace pinwell
