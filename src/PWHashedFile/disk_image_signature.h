// The place and the contents of a disk image's signature: trailer (formats/udif_header.h), then superblob
// (blob_set.h).
//
// | From         | To           | What                                                             |
// |--------------|--------------|------------------------------------------------------------------|
// | 0            | csStart      | the image's data, not read here                                  |
// | csStart      | size - 512   | the superblob; empty in unsigned images                          |
// | size - 512   | size         | the trailer, which gives the superblob's place                   |
//
// The steps are called in this order, each only if the one before returned true. A step that returns false
// leaves its reason in `fault`, and a message for the verbose mode. No step throws.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "files/file_reader.h"
#include "foundation/bytes.h"
#include "src/PWHashedFile/blob_set.h"
#include "formats/udif_header.h"
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

    /// Why these are not valid, with the offset in the file.
    std::optional<ticket_fault> fault;

    /// As the trailer says; an unsigned image has no superblob.
    bool isSigned() const noexcept { return csStart != 0 && csLength != 0; }

    /// Returns false, for the step to return.
    bool refuse(std::uint64_t offset, const char* rule);
};

/// Reads the trailer: the kind of the file, and the superblob's place. `name` is for the messages.
bool readDiskImageTrailer(files::FileReader& file, const std::string& name, disk_image_signature& into);

/// Reads the whole superblob of a signed image. Holes and zeros take no memory. If it is too long for its own
/// length field, only its header is read, and the superblob is refused.
bool readDiskImageSuperblob(files::FileReader& file, const std::string& name, disk_image_signature& into);

/// Splits the superblob.
bool readDiskImageBlobs(const std::string& name, disk_image_signature& into);

/// The blob of the stapled ticket: the last one in its slot; null if there is none.
const BlobRecord* ticketBlobOf(const BlobSet& blobs);

/// The ticket in its blob: the bytes after the blob's header.
foundation::ByteView ticketIn(const BlobRecord& blob);

}  // namespace pinwell
