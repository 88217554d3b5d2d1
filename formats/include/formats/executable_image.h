// The headers of executable images.
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
// Load commands 0x1 (32-bit) and 0x19 (64-bit) describe a segment.
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
// Each slice is a thin image. These functions read the fields and have no other rules. The rules for finding
// a signature are in codesign/executable_image.h, those of deep verification in
// verify/image_layout.h.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

#include "base/byte_io.h"
#include "base/bytes.h"

namespace pinwell {

inline constexpr std::uint32_t kImageMagic32 = 0xFEEDFACE;
inline constexpr std::uint32_t kImageMagic64 = 0xFEEDFACF;
inline constexpr std::size_t kImageHeaderSize32 = 28;
inline constexpr std::size_t kImageHeaderSize64 = 32;
inline constexpr std::uint32_t kFileTypeExecutable = 2;  // a program, not a library

inline constexpr std::uint32_t kLoadCommandHeaderSize = 8;
inline constexpr std::uint32_t kLoadCommandSegment32 = 0x1;
inline constexpr std::uint32_t kLoadCommandSegment64 = 0x19;
inline constexpr std::uint32_t kLoadCommandSignature = 0x1D;
inline constexpr std::uint32_t kSignatureCommandSize = 16;

inline constexpr std::uint32_t kUniversalMagic32 = 0xCAFEBABE;
inline constexpr std::uint32_t kUniversalMagic64 = 0xCAFEBABF;
inline constexpr std::size_t kUniversalHeaderSize = 8;

inline constexpr std::uint32_t kCpuType64Arm = 0x0100000C;
inline constexpr std::uint32_t kCpuType64X86 = 0x01000007;

/// The upper byte of a CPU subtype describes features of the code, not the processor.
inline constexpr std::uint32_t kCpuSubtypeCapabilities = 0xFF000000;

/// Byte order and width of a thin image.
struct ImageForm {
    bool isBigEndian = false;
    bool is64 = false;

    std::size_t headerSize() const noexcept { return is64 ? kImageHeaderSize64 : kImageHeaderSize32; }
};

/// By the magic at the start; `nullopt` if it is not that of a thin image. Throws base::ShortRead for less
/// than four bytes.
std::optional<ImageForm> imageFormOf(base::ByteView start);

/// Reads numbers in the order and width of one image. Throws base::ShortRead.
class ImageReader {
  public:
    ImageReader(base::ByteView bytes, ImageForm form) : reader_(bytes), form_(form) {}

    bool is64() const noexcept { return form_.is64; }
    std::uint32_t u32(std::string_view what) {
        return form_.isBigEndian ? reader_.be32(what) : reader_.le32(what);
    }
    /// 4 bytes in a 32-bit image, 8 in a 64-bit one.
    std::uint64_t word(std::string_view what) {
        if (!form_.is64) return u32(what);
        return form_.isBigEndian ? reader_.be64(what) : reader_.le64(what);
    }
    base::ByteView bytes(std::uint64_t length, std::string_view what) { return reader_.bytes(length, what); }
    void skip(std::uint64_t length, std::string_view what) { reader_.skip(length, what); }

    /// A reader of the next `length` bytes.
    ImageReader take(std::uint64_t length, std::string_view what) { return {bytes(length, what), form_}; }

  private:
    base::ByteReader reader_;
    ImageForm form_;
};

struct ImageHeader {
    ImageForm form;
    std::uint32_t cpuType = 0;
    std::uint32_t cpuSubtype = 0;  // with capabilities
    std::uint32_t fileType = 0;
    std::uint32_t commandCount = 0;
    std::uint32_t commandsSize = 0;
};

/// From the first kImageHeaderSize32 bytes of a slice; `nullopt` if it is not a thin image. Throws
/// base::ShortRead for less.
std::optional<ImageHeader> readImageHeader(base::ByteView start);

struct UniversalHeader {
    bool is64 = false;  // the entries
    std::uint32_t sliceCount = 0;

    std::size_t entrySize() const noexcept { return is64 ? 32 : 20; }
    std::uint64_t listSize() const noexcept { return std::uint64_t{sliceCount} * entrySize(); }
};

/// By the first four bytes of a file. Throws base::ShortRead for less.
bool isUniversalMagic(base::ByteView start);

/// From the first kUniversalHeaderSize bytes of a file; `nullopt` if it is not a universal image. Throws
/// base::ShortRead for less.
std::optional<UniversalHeader> readUniversalHeader(base::ByteView start);

/// One slice in the list of a universal image.
struct UniversalEntry {
    std::uint32_t cpuType = 0;
    std::uint32_t cpuSubtype = 0;  // with capabilities
    std::uint64_t offset = 0;
    std::uint64_t length = 0;
    std::uint32_t alignment = 0;  // as a power of two
    std::uint32_t spare = 0;
};

/// From the entrySize() bytes of the entry. Throws base::ShortRead for less.
UniversalEntry readUniversalEntry(base::ByteView bytes, const UniversalHeader& header);

}  // namespace pinwell
