#include "codesign/superblob.h"

#include <algorithm>

#include "codesign/code_error.h"
#include "foundation/byte_reader.h"
#include "foundation/byte_writer.h"

namespace pinwell::codesign {

using foundation::ByteReader;

namespace {

struct Range {
    std::uint64_t begin;
    std::uint64_t end;
};

void requireSuperblob(const SuperblobHeader& header) {
    if (header.magic != kSuperblobMagic) refuse("not a superblob");
    if (header.length < kSuperblobHeaderSize) refuse("the superblob is shorter than its header");
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

SurveyedBlob surveyBlob(ByteView superblob, const BlobIndexEntry& entry) {
    SurveyedBlob blob{.slot = entry.slot, .offset = entry.offset, .magic = {}, .length = {}, .bytes = {}};
    if (entry.offset >= superblob.size()) return blob;
    blob.bytes = superblob.subspan(entry.offset);
    if (blob.bytes.size() < kBlobHeaderSize) return blob;
    ByteReader reader(blob.bytes);
    const BlobHeader header = readBlobHeader(reader);
    blob.magic = header.magic;
    blob.length = header.length;
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
        count = readSuperblobHeader(index).count;
        for (std::uint32_t i = 0; i < count; ++i)
            if (!visit(surveyBlob(superblob, readBlobIndexEntry(index)))) break;
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
    ByteReader start(superblob);
    const SuperblobHeader header = readSuperblobHeader(start);
    requireSuperblob(header);
    const ByteReader whole = ByteReader(superblob).sub(0, header.length, "superblob");

    ByteReader index = whole;
    index.skip(kSuperblobHeaderSize, "superblob header");
    const std::uint64_t indexSize = std::uint64_t{kBlobIndexEntrySize} * header.count;
    // Checked before the count sizes anything.
    static_cast<void>(index.sub(index.position(), indexSize, "superblob index"));

    std::vector<Blob> blobs;
    std::vector<Range> ranges = {{0, kSuperblobHeaderSize + indexSize}};
    blobs.reserve(header.count);
    ranges.reserve(header.count + std::size_t{1});
    for (std::uint32_t i = 0; i < header.count; ++i) {
        const BlobIndexEntry entry = readBlobIndexEntry(index);
        ByteReader blobStart = whole.sub(entry.offset, kBlobHeaderSize, "blob header");
        const BlobHeader blob = readBlobHeader(blobStart);
        if (blob.length < kBlobHeaderSize) refuse("a blob is shorter than its header");
        ByteReader content = whole.sub(entry.offset, blob.length, "blob");
        blobs.push_back({entry.slot, blob.magic, content.bytes(blob.length, "blob")});
        ranges.push_back({entry.offset, std::uint64_t{entry.offset} + blob.length});
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
    const std::size_t first = kSuperblobHeaderSize + kBlobIndexEntrySize * blobs.size();
    foundation::ByteWriter index;
    foundation::ByteWriter content;
    for (const auto& [slot, bytes] : blobs) {
        index.be32(slot).be32(static_cast<std::uint32_t>(first + content.size()));
        content.bytes(bytes);
    }
    foundation::ByteWriter writer;
    writer.be32(kSuperblobMagic).be32(static_cast<std::uint32_t>(first + content.size()));
    writer.be32(static_cast<std::uint32_t>(blobs.size())).bytes(index.data()).bytes(content.data());
    return std::move(writer).take();
}

SharedBytes readSuperBlob(const ByteSource& source, std::uint64_t offset, std::uint64_t areaLength) {
    if (areaLength < kSuperblobHeaderSize) refuse("the signature area is too short for a superblob");
    const Data start = source.read(offset, kSuperblobHeaderSize);
    ByteReader reader(start);
    const SuperblobHeader header = readSuperblobHeader(reader);
    requireSuperblob(header);
    if (header.length > areaLength) refuse("the superblob is longer than its area");
    return source.readShared(offset, header.length);
}

}  // namespace pinwell::codesign
