#include "codesign/disk_image_trailer.h"

namespace pinwell::codesign {

std::optional<DiskImageTrailer> DiskImageTrailer::read(const ByteSource& source) {
    if (source.size() < kUDIFHeaderSize) return std::nullopt;
    const std::uint64_t offset = source.size() - kUDIFHeaderSize;
    UDIFFileHeader header;
    const bool isWhole = header.assign(source.read(offset, kUDIFHeaderSize));
    if (!isWhole || !header.hasMagic() || header.version() != kUDIFVersion) return std::nullopt;
    return DiskImageTrailer(header, offset);
}

std::optional<FileRange> DiskImageTrailer::signature() const {
    const FileRange range{header_.codeSignOffset(), header_.codeSignLength()};
    if (range.offset == 0 || range.length == 0) return std::nullopt;
    return range;
}

std::uint64_t DiskImageTrailer::signedLimit() const {
    const std::optional<FileRange> area = signature();
    const bool endsAtTrailer = area && area->offset <= offset_ && area->length == offset_ - area->offset;
    return endsAtTrailer ? area->offset : offset_;
}

Data DiskImageTrailer::canonicalBytes() const {
    UDIFFileHeader canonical = header_;
    canonical.setCodeSign(0, 0);
    return foundation::toData(canonical.bytes());
}

}  // namespace pinwell::codesign
