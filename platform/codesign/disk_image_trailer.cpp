#include "codesign/disk_image_trailer.h"

#include <algorithm>

#include "foundation/byte_reader.h"

namespace pinwell::codesign {

using foundation::ByteReader;

namespace {

constexpr std::uint32_t kTrailerMagic = 0x6B6F6C79;  // "koly"
constexpr std::uint32_t kTrailerVersion = 4;
constexpr std::size_t kSignatureFieldsOffset = 296;
constexpr std::size_t kSignatureFieldsSize = 16;

}  // namespace

std::optional<DiskImageTrailer> DiskImageTrailer::read(const ByteSource& source) {
    if (source.size() < kTrailerSize) return std::nullopt;
    const std::uint64_t offset = source.size() - kTrailerSize;
    Data bytes = source.read(offset, kTrailerSize);
    ByteReader reader(bytes);
    if (reader.be32("trailer magic") != kTrailerMagic) return std::nullopt;
    if (reader.be32("trailer version") != kTrailerVersion) return std::nullopt;
    return DiskImageTrailer(std::move(bytes), offset);
}

std::optional<FileRange> DiskImageTrailer::signature() const {
    ByteReader reader(bytes_);
    reader.seek(kSignatureFieldsOffset, "signature offset");
    FileRange range;
    range.offset = reader.be64("signature offset");
    range.length = reader.be64("signature length");
    if (range.offset == 0 || range.length == 0) return std::nullopt;
    return range;
}

std::uint64_t DiskImageTrailer::signedLimit() const {
    const std::optional<FileRange> area = signature();
    const bool endsAtTrailer = area && area->offset <= offset_ && area->length == offset_ - area->offset;
    return endsAtTrailer ? area->offset : offset_;
}

Data DiskImageTrailer::canonicalBytes() const {
    Data canonical = bytes_;
    std::fill_n(canonical.begin() + kSignatureFieldsOffset, kSignatureFieldsSize, std::byte{0});
    return canonical;
}

}  // namespace pinwell::codesign
