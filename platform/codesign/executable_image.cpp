#include "codesign/executable_image.h"

#include <algorithm>
#include <utility>
#include <vector>

#include "base/byte_io.h"
#include "codesign/code_error.h"

namespace pinwell::codesign {

using base::ByteReader;

namespace {

constexpr std::uint32_t kMagic32 = 0xFEEDFACE;
constexpr std::uint32_t kMagic64 = 0xFEEDFACF;
constexpr std::uint32_t kUniversalMagic32 = 0xCAFEBABE;
constexpr std::uint32_t kUniversalMagic64 = 0xCAFEBABF;
constexpr std::size_t kUniversalHeaderSize = 8;
constexpr std::size_t kSliceEntrySize32 = 20;
constexpr std::size_t kSliceEntrySize64 = 32;
constexpr std::size_t kThinHeaderSize32 = 28;
constexpr std::size_t kThinHeaderSize64 = 32;
constexpr std::uint32_t kLoadCommandHeaderSize = 8;
constexpr std::uint32_t kSignatureCommandSize = 16;

/// Bytes of a list read at once. Most lists of load commands fit.
constexpr std::size_t kPieceSize = std::size_t{16} * 1024;

/// Reads the bytes of a file's range in order, with one piece in memory at a time.
class PieceReader {
  public:
    /// `range` must lie within `source`.
    PieceReader(const ByteSource& source, const FileRange& range)
        : source_(source), position_(range.offset), remaining_(range.length) {}

    /// The next `length` bytes, at most kPieceSize, valid until the next call.
    ByteView next(std::size_t length, const char* what) {
        if (remaining_ < length) refuse(std::string(what) + " is cut short");
        if (piece_.size() - used_ < length) {
            piece_ = source_.read(position_,
                                  static_cast<std::size_t>(std::min<std::uint64_t>(kPieceSize, remaining_)));
            used_ = 0;
        }
        const ByteView bytes = ByteView(piece_).subspan(used_, length);
        used_ += length;
        moveBy(length);
        return bytes;
    }

    void skip(std::uint64_t length, const char* what) {
        if (remaining_ < length) refuse(std::string(what) + " is cut short");
        used_ += static_cast<std::size_t>(std::min<std::uint64_t>(length, piece_.size() - used_));
        moveBy(length);
    }

  private:
    void moveBy(std::uint64_t length) {
        position_ += length;
        remaining_ -= length;
    }

    const ByteSource& source_;
    std::uint64_t position_;  // in the file
    std::uint64_t remaining_;
    Data piece_;
    std::size_t used_ = 0;  // of the piece
};

/// Reads 32-bit numbers in the order of one image.
class OrderedReader {
  public:
    OrderedReader(ByteView bytes, bool bigEndian) : reader_(bytes), bigEndian_(bigEndian) {}

    std::uint32_t u32(std::string_view what) { return bigEndian_ ? reader_.be32(what) : reader_.le32(what); }
    void skip(std::uint64_t length, std::string_view what) { reader_.skip(length, what); }

  private:
    ByteReader reader_;
    bool bigEndian_;
};

struct ThinMagic {
    bool bigEndian;
    bool is64;
};

std::optional<ThinMagic> thinMagic(ByteView start) {
    const std::uint32_t big = ByteReader(start).be32("magic");
    const std::uint32_t little = ByteReader(start).le32("magic");
    if (big == kMagic32 || big == kMagic64) return ThinMagic{true, big == kMagic64};
    if (little == kMagic32 || little == kMagic64) return ThinMagic{false, little == kMagic64};
    return std::nullopt;
}

bool isUniversalMagic(std::uint32_t magic) {
    return magic == kUniversalMagic32 || magic == kUniversalMagic64;
}

void requireInside(const FileRange& inner, std::uint64_t first, std::uint64_t size, const char* what) {
    const bool inside = inner.offset >= first && inner.offset <= size && inner.length <= size - inner.offset;
    if (!inside) refuse(std::string(what) + " lies outside its place");
}

void requireSeparate(const std::vector<ImageSlice>& slices) {
    std::vector<FileRange> ranges;
    for (const ImageSlice& slice : slices) ranges.push_back(slice.range);
    std::sort(ranges.begin(), ranges.end(), [](const FileRange& a, const FileRange& b) {
        return a.offset < b.offset || (a.offset == b.offset && a.length < b.length);
    });
    const auto overlap = std::adjacent_find(
        ranges.begin(), ranges.end(),
        [](const FileRange& a, const FileRange& b) { return b.offset - a.offset < a.length; });
    if (overlap != ranges.end()) refuse("slices overlap");
}

void requireDistinct(const std::vector<ImageSlice>& slices) {
    std::vector<std::pair<std::uint32_t, std::uint32_t>> processors;
    for (const ImageSlice& slice : slices)
        processors.emplace_back(slice.cpuType, slice.cpuSubtype & ~kCpuSubtypeCapabilities);
    std::sort(processors.begin(), processors.end());
    if (std::adjacent_find(processors.begin(), processors.end()) != processors.end())
        refuse("two slices of one CPU type and subtype");
}

ImageSlice readSliceEntry(ByteReader entry, bool is64) {
    ImageSlice slice;
    slice.cpuType = entry.be32("CPU type");
    slice.cpuSubtype = entry.be32("CPU subtype");
    slice.range.offset = is64 ? entry.be64("slice offset") : entry.be32("slice offset");
    slice.range.length = is64 ? entry.be64("slice size") : entry.be32("slice size");
    return slice;
}

std::vector<ImageSlice> readUniversal(const ByteSource& source) {
    const Data start = source.read(0, kUniversalHeaderSize);
    ByteReader header(start);
    const bool is64 = header.be32("magic") == kUniversalMagic64;
    const std::uint32_t count = header.be32("slice count");
    if (count == 0) refuse("a universal image without slices");

    const std::size_t entrySize = is64 ? kSliceEntrySize64 : kSliceEntrySize32;
    const FileRange list = {kUniversalHeaderSize, std::uint64_t{count} * entrySize};
    requireInside(list, 0, source.size(), "the list of slices");
    PieceReader entries(source, list);
    std::vector<ImageSlice> slices;
    for (std::uint32_t i = 0; i < count; ++i) {
        slices.push_back(readSliceEntry(ByteReader(entries.next(entrySize, "the list of slices")), is64));
        requireInside(slices.back().range, list.offset + list.length, source.size(), "a slice");
    }
    requireSeparate(slices);
    requireDistinct(slices);
    return slices;
}

/// The signature that the load commands give, relative to the image.
std::optional<FileRange> walkLoadCommands(PieceReader commands, bool bigEndian, std::uint32_t count) {
    std::optional<FileRange> found;
    // Every command takes at least eight bytes of a bounded space, so a false count ends the walk early.
    for (std::uint32_t i = 0; i < count; ++i) {
        OrderedReader header(commands.next(kLoadCommandHeaderSize, "a load command"), bigEndian);
        const std::uint32_t command = header.u32("load command");
        const std::uint32_t size = header.u32("load command size");
        if (size < kLoadCommandHeaderSize) refuse("a load command is shorter than its header");
        if (command != kLoadCommandSignature) {
            commands.skip(size - kLoadCommandHeaderSize, "a load command");
            continue;
        }
        if (size != kSignatureCommandSize) refuse("the signature's load command has a wrong size");
        if (found) refuse("two load commands give a signature");
        OrderedReader body(commands.next(size - kLoadCommandHeaderSize, "a load command"), bigEndian);
        found.emplace();
        found->offset = body.u32("signature offset");
        found->length = body.u32("signature length");
    }
    return found;
}

}  // namespace

bool isExecutableImage(const ByteSource& source) {
    if (source.size() < 4) return false;
    const Data start = source.read(0, 4);
    return thinMagic(start).has_value() || isUniversalMagic(ByteReader(start).be32("magic"));
}

std::vector<ImageSlice> readSlices(const ByteSource& source) {
    const Data start = source.read(0, 8);
    if (isUniversalMagic(ByteReader(start).be32("magic"))) return readUniversal(source);
    const std::optional<ThinMagic> magic = thinMagic(start);
    if (!magic) refuse("not an executable image");
    OrderedReader reader(start, magic->bigEndian);
    reader.skip(4, "magic");
    ImageSlice whole;
    whole.cpuType = reader.u32("CPU type");
    whole.range.length = source.size();
    return {whole};
}

const ImageSlice& preferredSlice(const std::vector<ImageSlice>& slices) {
    for (const std::uint32_t cpuType : {kCpuType64Arm, kCpuType64X86}) {
        const auto match = std::find_if(slices.begin(), slices.end(), [cpuType](const ImageSlice& slice) {
            return slice.cpuType == cpuType;
        });
        if (match != slices.end()) return *match;
    }
    return slices.front();
}

std::optional<FileRange> findImageSignature(const ByteSource& source, const ImageSlice& slice) {
    if (slice.range.length < kThinHeaderSize32) refuse("a slice is shorter than an image header");
    const Data start = source.read(slice.range.offset, kThinHeaderSize32);
    const std::optional<ThinMagic> magic = thinMagic(start);
    if (!magic) refuse("a slice is not an executable image");

    OrderedReader header(start, magic->bigEndian);
    header.skip(16, "magic, CPU and file type");
    const std::uint32_t count = header.u32("count of load commands");
    const std::uint32_t size = header.u32("size of load commands");
    const FileRange commands = {magic->is64 ? kThinHeaderSize64 : kThinHeaderSize32, size};
    requireInside(commands, 0, slice.range.length, "the list of load commands");

    std::optional<FileRange> signature = walkLoadCommands(
        PieceReader(source, {slice.range.offset + commands.offset, size}), magic->bigEndian, count);
    if (!signature || signature->length == 0) return std::nullopt;
    requireInside(*signature, commands.offset + commands.length, slice.range.length, "the signature");
    signature->offset += slice.range.offset;
    return signature;
}

}  // namespace pinwell::codesign
