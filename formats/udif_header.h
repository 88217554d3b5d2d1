// The trailer of a UDIF disk image: the last 512 bytes of the file, packed, all integers big-endian.
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
// Only the first three and the two code-signature fields are read; all others are kept as stored.
#pragma once

#include <array>
#include <cstdint>

#include "foundation/bytes.h"

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
    bool assign(foundation::ByteView bytes);

    bool hasMagic() const;

    /// The magic's four bytes as a little-endian number, as messages show a wrong magic.
    std::uint32_t magicAsShown() const;

    std::uint32_t version() const;
    std::uint32_t headerSize() const;  // as stored
    std::uint64_t codeSignOffset() const;
    std::uint64_t codeSignLength() const;

    /// Changes only these two fields.
    void setCodeSign(std::uint64_t offset, std::uint64_t length);

    foundation::ByteView bytes() const noexcept { return bytes_; }

  private:
    std::array<std::byte, kUDIFHeaderSize> bytes_{};
};

}  // namespace pinwell
