// Where a disk image's signature stands, and what stands in it: trailer (udif_header.h), then superblob
// (blob_set.h).
//
// | From         | To           | What                                                             |
// |--------------|--------------|------------------------------------------------------------------|
// | 0            | csStart      | the image's data, not looked at here                             |
// | csStart      | size - 512   | the superblob; nothing in unsigned images                        |
// | size - 512   | size         | the trailer, which says where the superblob stands               |
//
// The steps are taken in this order, each when the one before has answered true. A step that answers false
// has left its reason in `fault`, and a message for the verbose mode. None throws.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "files/file_reader.h"
#include "foundation/bytes.h"
#include "src/PWHashedFile/blob_set.h"
#include "src/PWHashedFile/udif_header.h"
#include "src/ticket_fault.h"

namespace pinwell {

/// Offsets and lengths are in bytes, offsets from the start of the file.
struct disk_image_signature {
    UDIFFileHeader trailer;
    std::uint64_t fileSize = 0;
    std::uint64_t csStart = 0;
    std::uint64_t csLength = 0;
    foundation::SharedBytes superblob;
    std::uint32_t numBlobs = 0;  // as stated
    BlobSet blobs;               // views of the superblob

    /// Why these are not a disk image's, and where in the file.
    std::optional<ticket_fault> fault;

    /// As the trailer has it; an unsigned image has no superblob to read.
    bool isSigned() const noexcept { return csStart != 0 && csLength != 0; }

    /// Always false, for the step that ends with it.
    bool refuse(std::uint64_t offset, const char* rule);
};

/// Reads the trailer: what kind of file it is, and where the superblob stands. `name` is for the messages.
bool readDiskImageTrailer(files::FileReader& file, const std::string& name, disk_image_signature& into);

/// Reads the superblob of a signed image, whole: memory is taken for what is there, not for holes and zeros.
/// One that is longer than its own length field can say is left after its header, by which it is refused.
bool readDiskImageSuperblob(files::FileReader& file, const std::string& name, disk_image_signature& into);

/// Takes the superblob apart.
bool readDiskImageBlobs(const std::string& name, disk_image_signature& into);

/// The blob of the stapled ticket, the last one that stands in its slot; null when there is none.
const BlobRecord* ticketBlobOf(const BlobSet& blobs);

/// The ticket in its blob: what stands behind the blob's header.
foundation::ByteView ticketIn(const BlobRecord& blob);

}  // namespace pinwell
