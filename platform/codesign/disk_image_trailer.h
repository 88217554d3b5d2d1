// The trailer of a disk image (formats/udif_header.h), as far as its signature needs it.
#pragma once

#include <cstdint>
#include <optional>

#include "codesign/executable_image.h"
#include "formats/udif_header.h"

namespace pinwell::codesign {

/// The special slot of a code directory that covers the trailer.
inline constexpr std::uint32_t kSlotTrailer = 6;

/// A disk image's trailer. A value.
class DiskImageTrailer {
  public:
    /// The trailer at the end of `source`; `nullopt` if there is none. Throws CodeError only if the bytes
    /// cannot be read.
    static std::optional<DiskImageTrailer> read(const ByteSource& source);

    /// The offset of the trailer itself.
    std::uint64_t offset() const noexcept { return offset_; }

    /// The signature's place according to the trailer, unchecked; `nullopt` if offset or length is
    /// zero.
    std::optional<FileRange> signature() const;

    /// The end of the image's signed part: the start of a signature that ends at the trailer, otherwise the
    /// trailer. So inserting a signature before the trailer does not change the signed part.
    std::uint64_t signedLimit() const;

    /// The bytes that a signature covers: the trailer with both of its signature fields zeroed.
    Data canonicalBytes() const;

  private:
    DiskImageTrailer(const UDIFFileHeader& header, std::uint64_t offset) : header_(header), offset_(offset) {}

    UDIFFileHeader header_;
    std::uint64_t offset_;
};

}  // namespace pinwell::codesign
