#include "codesign/superblob.h"

#include <algorithm>

#include "base/byte_io.h"
#include "codesign/code_error.h"

namespace pinwell::codesign {

using base::ByteReader;

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

}  // namespace

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

Data buildSuperBlob(const std::vector<std::pair<std::uint32_t, Data>>& blobs) {
    const std::size_t first = kSuperblobHeaderSize + kBlobIndexEntrySize * blobs.size();
    base::ByteWriter index;
    base::ByteWriter content;
    for (const auto& [slot, bytes] : blobs) {
        index.be32(slot).be32(static_cast<std::uint32_t>(first + content.size()));
        content.bytes(bytes);
    }
    base::ByteWriter writer;
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
