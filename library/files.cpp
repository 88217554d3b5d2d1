// Finds a ticket in a disk image and in a flat package, by the steps of the tool.
#include <utility>

#include "files/file_reader.h"
#include "library/conversion.h"
#include "src/PWHashedFile/disk_image_signature.h"
#include "src/PWHashedFile/held_ticket.h"
#include "src/PWHashedFile/package_trailer_walk.h"

namespace pinwell::ticket {
inline namespace v0 {

static_assert(kTrailerTerminator == kTerminatorTrailerType && kTrailerTicket == kTicketTrailerType);

namespace {

using files::FileReader;
using Opened = foundation::Result<std::unique_ptr<FileReader>>;

/// The parsers' own messages, which name the file, are for the tool's verbose mode.
constexpr const char* kNoName = "";

Slot slotOf(const BlobRecord& blob, std::uint64_t superblobOffset) {
    return {blob.slotType,
            std::string(slotName(blob.slotType)),
            blob.magic,
            {superblobOffset + blob.offset, blob.length()}};
}

Result<DiskImage> diskImageIn(FileReader& file) {
    disk_image_signature read;
    const bool isImage = readDiskImageTrailer(file, kNoName, read) &&
                         (!read.isSigned() ||
                          (readDiskImageSuperblob(file, kNoName, read) && readDiskImageBlobs(kNoName, read)));
    if (!isImage) return malformed(*read.fault);

    DiskImage image;
    image.fileSize = read.fileSize;
    image.trailer = {read.fileSize - kUDIFHeaderSize, kUDIFHeaderSize};
    if (!read.isSigned()) return image;
    image.superblob = Range{read.csStart, read.csLength};
    for (const BlobRecord& blob : read.blobs) image.slots.push_back(slotOf(blob, read.csStart));
    if (const BlobRecord* const blob = ticketBlobOf(read.blobs)) {
        const ByteView bytes = ticketIn(*blob);
        const Range whole = slotOf(*blob, read.csStart).range;
        const std::uint64_t offset = whole.offset + whole.length - bytes.size();
        // A ticket is returned whole or not at all.
        if (const auto fault = faultOfTicketLength(bytes.size(), offset)) return malformed(*fault);
        image.ticket = FoundTicket{{offset, bytes.size()}, foundation::toData(bytes)};
    }
    return image;
}

Result<FlatPackage> flatPackageIn(FileReader& file) {
    FlatPackage package;
    package_trailers read =
        walkPackageTrailers(file, kNoName, [&](std::uint64_t recordOffset, const trailer_header& record) {
            // A length that leads out of the file ends the walk with a fault; then this value is not
            // returned.
            const std::uint64_t length = record.length();
            package.trailers.push_back({record.type(), recordOffset, {recordOffset - length, length}});
        });
    if (read.fault) return malformed(*read.fault);
    package.fileSize = read.fileSize;
    package.hasTerminator = read.hasTerminator;
    if (const auto fault = faultOfTicketLength(read.ticketLength, read.ticketStart)) return malformed(*fault);
    if (read.ticket)
        package.ticket = FoundTicket{{read.ticketStart, read.ticketLength}, *std::move(read.ticket)};
    return package;
}

template <class Read>
auto readIn(const Opened& file, Read read) -> decltype(read(**file)) {
    if (!file) return unreadable(file.error());
    return read(**file);
}

}  // namespace

Result<DiskImage> readDiskImage(const std::string& path) {
    return readIn(files::openReader(path), diskImageIn);
}

Result<DiskImage> readDiskImage(int descriptor) {
    return readIn(files::readerOf(descriptor, kNoName), diskImageIn);
}

Result<FlatPackage> readFlatPackage(const std::string& path) {
    return readIn(files::openReader(path), flatPackageIn);
}

Result<FlatPackage> readFlatPackage(int descriptor) {
    return readIn(files::readerOf(descriptor, kNoName), flatPackageIn);
}

}  // namespace v0
}  // namespace pinwell::ticket
