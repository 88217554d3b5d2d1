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

std::uint32_t readMagicAndLength(ByteReader& reader) {
    if (reader.be32("superblob magic") != kSuperBlobMagic) refuse("not a superblob");
    const std::uint32_t length = reader.be32("superblob length");
    if (length < kSuperBlobHeaderSize) refuse("the superblob is shorter than its header");
    if (length > kMaximumSuperBlobLength) refuse("the superblob is too long");
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
    if (count > kMaximumBlobCount) refuse("too many blobs");

    std::vector<Blob> blobs;
    std::vector<Range> ranges = {{0, kSuperBlobHeaderSize + std::uint64_t{8} * count}};
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
    count = 0;
    const ByteReader whole(superblob);
    ByteReader index = whole;
    try {
        index.skip(8, "superblob magic and length");
        count = index.be32("superblob count");
        for (std::uint32_t i = 0; i < count && i < maximum; ++i) {
            SurveyedBlob& blob = blobs.emplace_back();
            blob.slot = index.be32("index slot");
            blob.offset = index.be32("index offset");
            if (blob.offset >= superblob.size()) continue;
            blob.bytes = superblob.subspan(blob.offset);
            if (blob.bytes.size() < kBlobHeaderSize) continue;
            ByteReader header(blob.bytes);
            blob.magic = header.be32("blob magic");
            blob.length = header.be32("blob length");
            blob.bytes = blob.bytes.first(std::min<std::size_t>(*blob.length, blob.bytes.size()));
        }
    } catch (const foundation::ShortRead&) {
        if (!blobs.empty()) blobs.pop_back();  // the entry itself is cut off
    }
    return blobs;
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

Data readSuperBlob(const ByteSource& source, std::uint64_t offset, std::uint64_t areaLength) {
    if (areaLength < kSuperBlobHeaderSize) refuse("the signature area is too short for a superblob");
    const Data start = source.read(offset, kSuperBlobHeaderSize);
    ByteReader header(start);
    const std::uint32_t length = readMagicAndLength(header);
    if (length > areaLength) refuse("the superblob is longer than its area");
    return source.read(offset, length);
}

}  // namespace pinwell::codesign
