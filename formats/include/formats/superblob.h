// The superblob, the container of a code signature. All integers are big-endian; offsets count from its
// start.
//
// | Offset | Size      | Field                                                                       |
// |--------|-----------|-----------------------------------------------------------------------------|
// | 0      | 4         | magic FADE0CC0                                                              |
// | 4      | 4         | length of the whole, with this header                                       |
// | 8      | 4         | count of index entries                                                      |
// | 12     | 8 x count | index: slot (4), offset of the blob (4)                                     |
// | any    |           | blobs: magic (4), length with these 8 bytes (4), payload                    |
//
// Three readers share this layout:
//
// - the survey (surveySuperBlob) has no rules: it shows a damaged superblob;
// - the code-signing service accepts gaps and any order (codesign/superblob.h);
// - orderedBlobSetForSuperBlob is for disk images, whose superblob is written again. So the blobs directly
//   follow the index, in index order, without gaps, and the last one ends with the superblob. Two equal index
//   entries are refused too.
//
// No limit applies to the length or to the number of blobs: a record is a view, at most twice as large as the
// smallest blob with its index entry.
#pragma once

#include <compare>
#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

#include "base/byte_io.h"
#include "base/bytes.h"
#include "formats/findings.h"
#include "values/value.h"

namespace pinwell {

inline constexpr std::uint32_t kSuperblobMagic = 0xFADE0CC0;
inline constexpr std::uint32_t kSuperblobHeaderSize = 12;
inline constexpr std::uint32_t kBlobIndexEntrySize = 8;
inline constexpr std::uint32_t kBlobHeaderSize = 8;

/// The magic of a blob around bytes that are not a blob themselves: the signer's message, and a ticket.
inline constexpr std::uint32_t kWrapperMagic = 0xFADE0B01;

// Slots of the index.
inline constexpr std::uint32_t kSlotCodeDirectory = 0;
inline constexpr std::uint32_t kSlotRequirements = 2;
inline constexpr std::uint32_t kSlotEntitlements = 5;
inline constexpr std::uint32_t kSlotTrailer = 6;  // of a disk image; not in the superblob
inline constexpr std::uint32_t kSlotDerEntitlements = 7;
inline constexpr std::uint32_t kSlotFirstAlternate = 0x1000;
inline constexpr std::uint32_t kSlotLastAlternate = 0x1004;
inline constexpr std::uint32_t kSlotCms = 0x10000;

/// The slot of a stapled ticket, and the magic of its blob.
inline constexpr std::uint32_t kTicketSlotType = 0x10002;
inline constexpr std::uint32_t kTicketBlobMagic = kWrapperMagic;

/// Whether it is the slot of an alternate code directory.
bool isAlternateSlot(std::uint32_t slot);

/// The contents of a slot in words; "unknown" for an unknown slot.
std::string_view slotName(std::uint32_t slot);

// The fields, without a rule.

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

// Each reads at the reader's position, and throws base::ShortRead, which names the field.
SuperblobHeader readSuperblobHeader(base::ByteReader& reader);
BlobIndexEntry readBlobIndexEntry(base::ByteReader& reader);
BlobHeader readBlobHeader(base::ByteReader& reader);

// The survey.

/// An entry of an index, and the part of its blob within the superblob.
struct SurveyedBlob {
    std::uint32_t slot = 0;
    std::uint32_t offset = 0;             // as stated
    std::optional<std::uint32_t> magic;   // `nullopt` if there is no blob header at the offset
    std::optional<std::uint32_t> length;  // as stated
    base::ByteView bytes;                 // from the offset, up to the stated length or the end
};

/// The entries of an index, despite faults in it or in the blobs. The first `maximum` entries; `count`
/// becomes the header's count, or 0 without a header.
std::vector<SurveyedBlob> surveySuperBlob(base::ByteView superblob, std::size_t maximum,
                                          std::uint32_t& count);

/// The last entry for `slot` whose blob has a header, by the same rules; `nullopt` if there is none.
std::optional<SurveyedBlob> surveyLastBlobOf(std::uint32_t slot, base::ByteView superblob);

// The blobs of a disk image's superblob.

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
    base::ByteView data;  // with the blob's header

    std::uint64_t length() const noexcept { return data.size(); }

    /// The value of one of the five keys; null for any other.
    values::Value at(std::string_view key) const;

    /// Whether all keys have equal values.
    friend bool operator==(const BlobRecord& a, const BlobRecord& b);
};

/// Records in index order, no two of them equal.
using BlobSet = std::vector<BlobRecord>;

/// The blobs of a whole superblob with a stated count of `numberOfBlobs`, as views of it. Returns `nullopt`
/// if index entries are missing or equal, or if the blobs do not fill the superblob. Returns fewer than
/// `numberOfBlobs` records if a blob's own length is wrong but the others still fill the superblob.
std::optional<BlobSet> orderedBlobSetForSuperBlob(base::ByteView superblob, std::uint32_t numberOfBlobs,
                                                  const Diagnostics& diagnostics = {});

/// The superblob for a missing signature: a header with a count of 0.
base::Data emptySuperblob();

/// Whether the length of superblobWithTicket's result fits the 32 bits in its
/// header.
bool hasRoomForTicket(const BlobSet& blobs, base::ByteView ticket);

/// The superblob of all of `blobs` except tickets, then `ticket` in its own blob unless it is empty, then
/// `spare` zero bytes for the caller to fill. Empty if no blob remains. hasRoomForTicket must hold. Throws
/// std::bad_alloc.
base::SparseBuffer superblobWithTicket(const BlobSet& blobs, base::ByteView ticket, std::size_t spare = 0,
                                       const Diagnostics& diagnostics = {});

}  // namespace pinwell
