// The superblob: the container of an embedded signature. formats/superblob_layout.h has its layout.
//
// The index may name the blobs in any order, and there may be gaps between them. The rest of the reserved
// area after the superblob's own length is padding and is never read.
//
// Refused: a wrong magic, a length or count that does not fit, two entries for a slot of the signature, and
// blobs that overlap each other or the index. Other slots, such as the ticket's, may have any number of
// entries. There is no limit on the length or on the number of blobs: a record here takes 40 bytes; the
// smallest blob takes 16 in the file.
#pragma once

#include <cstdint>
#include <optional>
#include <utility>
#include <vector>

#include "codesign/byte_source.h"
#include "codesign/code_signing.h"
#include "formats/superblob_layout.h"

namespace pinwell::codesign {

/// Slots of the index.
inline constexpr std::uint32_t kSlotCodeDirectory = 0;
inline constexpr std::uint32_t kSlotRequirements = 2;
inline constexpr std::uint32_t kSlotEntitlements = 5;
inline constexpr std::uint32_t kSlotTrailer = 6;  // of a disk image; not in the superblob
inline constexpr std::uint32_t kSlotDerEntitlements = 7;
inline constexpr std::uint32_t kSlotFirstAlternate = 0x1000;
inline constexpr std::uint32_t kSlotLastAlternate = 0x1004;
inline constexpr std::uint32_t kSlotCms = 0x10000;

/// Whether it is the slot of an alternate code directory.
bool isAlternateSlot(std::uint32_t slot);

/// Whether the signature is read from this slot: code directories, the components that they cover, and the
/// signer's message.
bool isSlotOfSignature(std::uint32_t slot);

/// One blob of a superblob.
struct Blob {
    std::uint32_t slot;
    std::uint32_t magic;
    ByteView bytes;  // with its header
};

/// The blobs, in index order, as views of `superblob`, which may have padding after it. Throws CodeError or
/// foundation::ShortRead.
std::vector<Blob> parseSuperBlob(ByteView superblob);

/// An entry of an index, and the part of its blob within the superblob.
struct SurveyedBlob {
    std::uint32_t slot = 0;
    std::uint32_t offset = 0;             // as stated
    std::optional<std::uint32_t> magic;   // `nullopt` if there is no blob header at the offset
    std::optional<std::uint32_t> length;  // as stated
    ByteView bytes;                       // from the offset, up to the stated length or the end
};

/// The entries of an index, despite faults in it or in the blobs: to show a superblob that
/// parseSuperBlob refuses. The first `maximum` entries; `count` becomes the header's count, or 0 without
/// a header.
std::vector<SurveyedBlob> surveySuperBlob(ByteView superblob, std::size_t maximum, std::uint32_t& count);

/// The last entry for `slot` whose blob has a header, by the same rules; `nullopt` if there is none.
std::optional<SurveyedBlob> surveyLastBlobOf(std::uint32_t slot, ByteView superblob);

/// The superblob in `source` at `offset`, in an area of `areaLength` bytes, without its padding. Only the
/// superblob itself is read. Throws CodeError.
SharedBytes readSuperBlob(const ByteSource& source, std::uint64_t offset, std::uint64_t areaLength);

/// The superblob of these blobs (slot, bytes with header), back to back in this order.
Data buildSuperBlob(const std::vector<std::pair<std::uint32_t, Data>>& blobs);

}  // namespace pinwell::codesign
