#include "formats/executable_image.h"

namespace pinwell {

using base::ByteReader;
using base::ByteView;

std::optional<ImageForm> imageFormOf(ByteView start) {
    const std::uint32_t big = ByteReader(start).be32("magic");
    const std::uint32_t little = ByteReader(start).le32("magic");
    if (big == kImageMagic32 || big == kImageMagic64) return ImageForm{true, big == kImageMagic64};
    if (little == kImageMagic32 || little == kImageMagic64) return ImageForm{false, little == kImageMagic64};
    return std::nullopt;
}

std::optional<ImageHeader> readImageHeader(ByteView start) {
    const std::optional<ImageForm> form = imageFormOf(start);
    if (!form) return std::nullopt;
    ImageReader reader(start, *form);
    reader.skip(4, "magic");
    ImageHeader header{.form = *form};
    header.cpuType = reader.u32("CPU type");
    header.cpuSubtype = reader.u32("CPU subtype");
    header.fileType = reader.u32("file type");
    header.commandCount = reader.u32("count of load commands");
    header.commandsSize = reader.u32("size of load commands");
    return header;
}

bool isUniversalMagic(ByteView start) {
    const std::uint32_t magic = ByteReader(start).be32("magic");
    return magic == kUniversalMagic32 || magic == kUniversalMagic64;
}

std::optional<UniversalHeader> readUniversalHeader(ByteView start) {
    if (!isUniversalMagic(start)) return std::nullopt;
    ByteReader reader(start);
    const bool is64 = reader.be32("magic") == kUniversalMagic64;
    return UniversalHeader{is64, reader.be32("slice count")};
}

UniversalEntry readUniversalEntry(ByteView bytes, const UniversalHeader& header) {
    ByteReader reader(bytes);
    UniversalEntry entry;
    entry.cpuType = reader.be32("CPU type");
    entry.cpuSubtype = reader.be32("CPU subtype");
    entry.offset = header.is64 ? reader.be64("slice offset") : reader.be32("slice offset");
    entry.length = header.is64 ? reader.be64("slice size") : reader.be32("slice size");
    entry.alignment = reader.be32("alignment");
    if (header.is64) entry.spare = reader.be32("spare");
    return entry;
}

}  // namespace pinwell
