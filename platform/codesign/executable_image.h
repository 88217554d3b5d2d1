// The parts of executable images that locate their signature.
//
// A thin image, in the byte order that its magic shows:
//
// | Offset   | Size         | Field                                                        |
// |----------|--------------|--------------------------------------------------------------|
// | 0        | 4            | magic FEEDFACE (32-bit) or FEEDFACF (64-bit)                 |
// | 4        | 8            | CPU type, CPU subtype                                        |
// | 12       | 4            | file type                                                    |
// | 16       | 4            | count of load commands                                       |
// | 20       | 4            | size of all load commands                                    |
// | 24       | 4            | flags; a 64-bit image has 4 reserved bytes more              |
// | 28 or 32 |              | load commands, each: command (4), size with these eight (4)  |
//
// Load command 0x1D, 16 bytes, gives the signature's offset and length, counted from the start of the image.
//
// A universal image, always big-endian:
//
// | Offset | Size       | Field                                                                         |
// |--------|------------|-------------------------------------------------------------------------------|
// | 0      | 4          | magic CAFEBABE (32-bit entries) or CAFEBABF (64-bit entries)                  |
// | 4      | 4          | count of slices                                                               |
// | 8      | 20 a slice | CPU type, CPU subtype, offset, size, alignment (4 each)                       |
// | 8      | 32 a slice | CPU type, CPU subtype (4 each), offset, size (8 each), alignment, spare (4)   |
//
// Each slice is a thin image. Refused: no slices, slices that overlap each other or the list, slices that
// reach past the file, two slices of one CPU type and subtype (a loader may take another than the one whose
// hash was looked up); load commands that do not fit their reserved space, two that give a signature, a
// signature that overlaps the load commands or reaches past its slice.
//
// There is no limit on the number of slices or load commands. Both lists are read piece by piece, so that
// work and memory grow with the file's contents and not with its claims.
#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "codesign/byte_source.h"

namespace pinwell::codesign {

inline constexpr std::uint32_t kCpuType64Arm = 0x0100000C;
inline constexpr std::uint32_t kCpuType64X86 = 0x01000007;
inline constexpr std::uint32_t kLoadCommandSignature = 0x1D;

/// The upper byte of a CPU subtype describes features of the code, not the processor.
inline constexpr std::uint32_t kCpuSubtypeCapabilities = 0xFF000000;

/// A part of a file.
struct FileRange {
    std::uint64_t offset = 0;
    std::uint64_t length = 0;

    bool operator==(const FileRange&) const = default;
};

/// One thin image and its place in the file.
struct ImageSlice {
    std::uint32_t cpuType = 0;
    std::uint32_t cpuSubtype = 0;  // as stated, with capabilities
    FileRange range;
};

/// Whether the file begins like an executable image. Throws CodeError only if it cannot be read.
bool isExecutableImage(const ByteSource& source);

/// The slices of a universal image, or the whole of a thin one; at least one. Throws CodeError.
std::vector<ImageSlice> readSlices(const ByteSource& source);

/// The slice that represents all: the first of CPU type 0x0100000C, otherwise the first of 0x01000007,
/// otherwise the first. The same on every host, so that every host looks up the same ticket.
const ImageSlice& preferredSlice(const std::vector<ImageSlice>& slices);

/// The place of a slice's signature in the file; `nullopt` if it is not signed. Throws CodeError or
/// base::ShortRead.
std::optional<FileRange> findImageSignature(const ByteSource& source, const ImageSlice& slice);

}  // namespace pinwell::codesign
