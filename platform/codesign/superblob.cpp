#include "codesign/superblob.h"

#include <algorithm>

#include "codesign/code_error.h"
#include "foundation/byte_reader.h"
#include "foundation/byte_writer.h"

namespace pinwell::codesign {

using foundation::ByteReader;

namespace {

constexpr std::size_t kIndexEntrySize = 8;

struct Range {
    std::uint64_t begin;
    std::uint64_t end;
};

std::uint32_t readMagicAndLength(ByteReader& reader) {
    if (reader.be32("superblob magic") != kSuperBlobMagic) refuse("not a superblob");
    const std::uint32_t length = reader.be32("superblob length");
    if (length < kSuperBlobHeaderSize) refuse("the superblob is shorter than its header");
    return length;
}

void requireDistinctSlots(const std::vector<Blob>& blobs) {
    std::vector<std::uint32_t> slots;
    for (const Blob& blob : blobs)
        if (isSlotOfSignature(blob.slot)) slots.push_back(blob.slot);
    std::sort(slots.begin(), slots.end());
    if (std::adjacent_find(slots.begin(), slots.end()) != slots.end()) refuse("two entries for one slot");
}

void requireSeparate(std::vector<Range> ranges) {
    std::sort(ranges.begin(), ranges.end(), [](Range a, Range b) { return a.begin < b.begin; });
    const auto overlap =
        std::adjacent_find(ranges.begin(), ranges.end(), [](Range a, Range b) { return b.begin < a.end; });
    if (overlap != ranges.end()) refuse("blobs overlap");
}

SurveyedBlob surveyBlob(ByteView superblob, std::uint32_t slot, std::uint32_t offset) {
    SurveyedBlob blob{.slot = slot, .offset = offset, .magic = {}, .length = {}, .bytes = {}};
    if (offset >= superblob.size()) return blob;
    blob.bytes = superblob.subspan(offset);
    if (blob.bytes.size() < kBlobHeaderSize) return blob;
    ByteReader header(blob.bytes);
    blob.magic = header.be32("blob magic");
    blob.length = header.be32("blob length");
    blob.bytes = blob.bytes.first(std::min<std::size_t>(*blob.length, blob.bytes.size()));
    return blob;
}

// Passes the entries of the index to `visit` while it returns true. Returns the stated count, or 0 without a
// header.
template <class Visit>
std::uint32_t survey(ByteView superblob, Visit visit) {
    std::uint32_t count = 0;
    try {
        ByteReader index(superblob);
        index.skip(8, "superblob magic and length");
        count = index.be32("superblob count");
        for (std::uint32_t i = 0; i < count; ++i) {
            const std::uint32_t slot = index.be32("index slot");
            const std::uint32_t offset = index.be32("index offset");
            if (!visit(surveyBlob(superblob, slot, offset))) break;
        }
    } catch (const foundation::ShortRead&) {
        // A truncated entry is ignored.
    }
    return count;
}

}  // namespace

bool isAlternateSlot(std::uint32_t slot) {
    return slot >= kSlotFirstAlternate && slot <= kSlotLastAlternate;
}

bool isSlotOfSignature(std::uint32_t slot) {
    return slot == kSlotCodeDirectory || slot == kSlotRequirements || slot == kSlotEntitlements ||
           slot == kSlotDerEntitlements || slot == kSlotCms || isAlternateSlot(slot);
}

std::vector<Blob> parseSuperBlob(ByteView superblob) {
    ByteReader header(superblob);
    const std::uint32_t length = readMagicAndLength(header);
    const ByteReader whole = ByteReader(superblob).sub(0, length, "superblob");

    ByteReader index = whole;
    index.seek(8, "superblob count");
    const std::uint32_t count = index.be32("superblob count");
    // Checked before the count sizes anything.
    static_cast<void>(index.sub(index.position(), std::uint64_t{kIndexEntrySize} * count, "superblob index"));

    std::vector<Blob> blobs;
    std::vector<Range> ranges = {{0, kSuperBlobHeaderSize + std::uint64_t{kIndexEntrySize} * count}};
    blobs.reserve(count);
    ranges.reserve(count + std::size_t{1});
    for (std::uint32_t i = 0; i < count; ++i) {
        const std::uint32_t slot = index.be32("index slot");
        const std::uint32_t offset = index.be32("index offset");
        ByteReader blob = whole.sub(offset, kBlobHeaderSize, "blob header");
        const std::uint32_t magic = blob.be32("blob magic");
        const std::uint32_t blobLength = blob.be32("blob length");
        if (blobLength < kBlobHeaderSize) refuse("a blob is shorter than its header");
        ByteReader content = whole.sub(offset, blobLength, "blob");
        blobs.push_back({slot, magic, content.bytes(blobLength, "blob")});
        ranges.push_back({offset, std::uint64_t{offset} + blobLength});
    }
    requireDistinctSlots(blobs);
    requireSeparate(std::move(ranges));
    return blobs;
}

std::vector<SurveyedBlob> surveySuperBlob(ByteView superblob, std::size_t maximum, std::uint32_t& count) {
    std::vector<SurveyedBlob> blobs;
    count = survey(superblob, [&](const SurveyedBlob& blob) {
        blobs.push_back(blob);
        return blobs.size() < maximum;
    });
    return blobs;
}

std::optional<SurveyedBlob> surveyLastBlobOf(std::uint32_t slot, ByteView superblob) {
    std::optional<SurveyedBlob> last;
    survey(superblob, [&](const SurveyedBlob& blob) {
        if (blob.slot == slot && blob.magic) last = blob;
        return true;
    });
    return last;
}

Data buildSuperBlob(const std::vector<std::pair<std::uint32_t, Data>>& blobs) {
    const std::size_t first = kSuperBlobHeaderSize + 8 * blobs.size();
    foundation::ByteWriter index;
    foundation::ByteWriter content;
    for (const auto& [slot, bytes] : blobs) {
        index.be32(slot).be32(static_cast<std::uint32_t>(first + content.size()));
        content.bytes(bytes);
    }
    foundation::ByteWriter writer;
    writer.be32(kSuperBlobMagic).be32(static_cast<std::uint32_t>(first + content.size()));
    writer.be32(static_cast<std::uint32_t>(blobs.size())).bytes(index.data()).bytes(content.data());
    return std::move(writer).take();
}

SharedBytes readSuperBlob(const ByteSource& source, std::uint64_t offset, std::uint64_t areaLength) {
    if (areaLength < kSuperBlobHeaderSize) refuse("the signature area is too short for a superblob");
    const Data start = source.read(offset, kSuperBlobHeaderSize);
    ByteReader header(start);
    const std::uint32_t length = readMagicAndLength(header);
    if (length > areaLength) refuse("the superblob is longer than its area");
    return source.readShared(offset, length);
}

}  // namespace pinwell::codesign
