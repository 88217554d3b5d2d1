// A UDIF disk image: its trailer, and its code signature between data and trailer.
//
// | From         | To           | What                                                             |
// |--------------|--------------|------------------------------------------------------------------|
// | 0            | csStart      | the image's data, not read here                                  |
// | csStart      | size - 512   | the superblob (superblob.h); empty in unsigned images            |
// | size - 512   | size         | the trailer, which gives the superblob's place                   |
//
// The trailer is packed, all integers big-endian:
//
// | Offset | Size | Field                                                                          |
// |--------|------|--------------------------------------------------------------------------------|
// | 0      | 4    | fUDIFSignature: "koly"                                                         |
// | 4      | 4    | fUDIFVersion: 4                                                                |
// | 8      | 4    | fUDIFHeaderSize                                                                |
// | 12     | 4    | fUDIFFlags                                                                     |
// | 16     | 8    | fUDIFRunningDataForkOffset                                                     |
// | 24     | 16   | fUDIFDataForkOffset, fUDIFDataForkLength                                       |
// | 40     | 16   | fUDIFRsrcForkOffset, fUDIFRsrcForkLength                                       |
// | 56     | 8    | fUDIFSegmentNumber, fUDIFSegmentCount (4 each)                                 |
// | 64     | 16   | fUDIFSegmentID                                                                 |
// | 80     | 136  | fUDIFDataForkChecksum: type (4), length (4), data (128)                        |
// | 216    | 16   | fUDIFXMLOffset, fUDIFXMLLength                                                 |
// | 232    | 64   | fUDIFExternal                                                                  |
// | 296    | 8    | fUDIFCodeSignOffset: offset of the superblob in the file; 0 if unsigned        |
// | 304    | 8    | fUDIFCodeSignLength: length of the superblob; 0 if unsigned                    |
// | 312    | 40   | fReserved                                                                      |
// | 352    | 136  | fUDIFMasterChecksum: type (4), length (4), data (128)                          |
// | 488    | 4    | fUDIFImageVariant                                                              |
// | 492    | 8    | fUDIFSectorCount, unaligned                                                    |
// | 500    | 12   | fPadding                                                                       |
//
// All fields are kept as stored. The tool reads only the first three and the two code-signature fields.
#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <string>

#include "base/byte_source.h"
#include "base/bytes.h"
#include "formats/findings.h"
#include "formats/superblob.h"

namespace pinwell {

inline constexpr std::size_t kUDIFHeaderSize = 512;
/// The offset of fUDIFCodeSignOffset, which fUDIFCodeSignLength follows.
inline constexpr std::size_t kUDIFCodeSignFieldsOffset = 296;
inline constexpr std::uint32_t kUDIFMagic = 0x6B6F6C79;  // "koly"
inline constexpr std::uint32_t kUDIFVersion = 4;

/// The 512 bytes as stored; single fields are converted when they are read or written. All zero at first.
class UDIFFileHeader {
  public:
    /// Copies `bytes` if there are exactly 512; returns whether there are.
    bool assign(base::ByteView bytes);

    bool hasMagic() const;

    /// The magic's four bytes as a little-endian number, as messages show a wrong magic.
    std::uint32_t magicAsShown() const;

    std::uint32_t version() const;
    std::uint32_t headerSize() const;  // as stored
    std::uint64_t dataForkOffset() const;
    std::uint64_t dataForkLength() const;
    std::uint64_t xmlOffset() const;
    std::uint64_t xmlLength() const;
    std::uint64_t codeSignOffset() const;
    std::uint64_t codeSignLength() const;

    /// The checksums: type (4), length (4), data (128). Views of this object.
    base::ByteView dataForkChecksum() const;
    base::ByteView masterChecksum() const;

    /// Changes only the two code-signature fields.
    void setCodeSign(std::uint64_t offset, std::uint64_t length);

    base::ByteView bytes() const noexcept { return bytes_; }

  private:
    std::array<std::byte, kUDIFHeaderSize> bytes_{};
};

/// The steps below fill it, in their order. Offsets and lengths are in bytes, offsets from the start of the
/// file.
struct DiskImageSignature {
    UDIFFileHeader trailer;
    std::uint64_t fileSize = 0;
    std::uint64_t csStart = 0;
    std::uint64_t csLength = 0;
    base::SharedBytes superblob;
    std::uint32_t numBlobs = 0;  // as stated
    BlobSet blobs;               // views of the superblob

    /// Why these are not valid, with the offset in the file.
    std::optional<TicketFault> fault;

    /// As the trailer says; an unsigned image has no superblob.
    bool isSigned() const noexcept { return csStart != 0 && csLength != 0; }

    /// Returns false, for the step to return.
    bool refuse(std::uint64_t offset, const char* rule);
};

// Each step is called only if the one before returned true. A step that returns false leaves its reason in
// `fault`, and a diagnostic line. No step throws.

/// Reads the trailer: the kind of the file, and the superblob's place. `name` is for the diagnostics.
bool readDiskImageTrailer(const base::ByteSource& file, const std::string& name, DiskImageSignature& into,
                          const Diagnostics& diagnostics = {});

/// Reads the whole superblob of a signed image. Holes and zeros take no memory. If it is too long for its own
/// length field, only its header is read, and the superblob is refused.
bool readDiskImageSuperblob(const base::ByteSource& file, const std::string& name, DiskImageSignature& into,
                            const Diagnostics& diagnostics = {});

/// Splits the superblob.
bool readDiskImageBlobs(const std::string& name, DiskImageSignature& into,
                        const Diagnostics& diagnostics = {});

/// The blob of the stapled ticket: the last one in its slot; null if there is none.
const BlobRecord* ticketBlobOf(const BlobSet& blobs);

/// The ticket in its blob: the bytes after the blob's header.
base::ByteView ticketIn(const BlobRecord& blob);

}  // namespace pinwell
