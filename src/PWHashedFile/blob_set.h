// The code-signature superblob of a disk image (formats/superblob_layout.h), split into its blobs and
// rebuilt.
//
// Stricter than the code-signing service, because the parts are written back: the blobs directly follow the
// index, in index order, without gaps, and the last one ends with the superblob. Two equal index entries are
// refused too. The contents of blobs are not read. There is no limit on the length or on the number of blobs:
// a record is a view, at most twice as large as the smallest blob with its index entry.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

#include "formats/superblob_layout.h"
#include "foundation/bytes.h"
#include "foundation/sparse_bytes.h"
#include "foundation/value.h"

namespace pinwell {

/// The slot of a stapled ticket, and the magic of its blob.
inline constexpr std::uint32_t kTicketSlotType = 0x10002;
inline constexpr std::uint32_t kTicketBlobMagic = kWrapperMagic;

/// The contents of a slot in words; "unknown" for an unknown slot.
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

/// The blobs of a whole superblob with a stated count of `numberOfBlobs`, as views of it. Returns `nullopt`
/// if index entries are missing or equal, or if the blobs do not fill the superblob. Returns fewer than
/// `numberOfBlobs` records if a blob's own length is wrong but the others still fill the superblob.
std::optional<BlobSet> orderedBlobSetForSuperBlob(foundation::ByteView superblob,
                                                  std::uint32_t numberOfBlobs);

/// The superblob for a missing signature: a header with a count of 0.
foundation::Data emptySuperblob();

/// Whether the length of superblobWithTicket's result fits the 32 bits in its
/// header.
bool hasRoomForTicket(const BlobSet& blobs, foundation::ByteView ticket);

/// The superblob of all of `blobs` except tickets, then `ticket` in its own blob unless it is empty, then
/// `spare` zero bytes for the caller to fill. Empty if no blob remains. hasRoomForTicket must hold. Throws
/// std::bad_alloc.
foundation::SparseBuffer superblobWithTicket(const BlobSet& blobs, foundation::ByteView ticket,
                                             std::size_t spare = 0);

}  // namespace pinwell
