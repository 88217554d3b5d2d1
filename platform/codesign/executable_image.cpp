#include "codesign/executable_image.h"

#include <algorithm>
#include <utility>
#include <vector>

#include "base/byte_io.h"
#include "codesign/code_error.h"

namespace pinwell::codesign {


namespace {

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

ImageSlice readSlice(ByteView bytes, const UniversalHeader& header) {
    const UniversalEntry entry = readUniversalEntry(bytes, header);
    return {entry.cpuType, entry.cpuSubtype, {entry.offset, entry.length}};
}

std::vector<ImageSlice> readUniversal(const ByteSource& source, const UniversalHeader& header) {
    if (header.sliceCount == 0) refuse("a universal image without slices");
    const FileRange list = {kUniversalHeaderSize, header.listSize()};
    requireInside(list, 0, source.size(), "the list of slices");
    PieceReader entries(source, list);
    std::vector<ImageSlice> slices;
    for (std::uint32_t i = 0; i < header.sliceCount; ++i) {
        slices.push_back(readSlice(entries.next(header.entrySize(), "the list of slices"), header));
        requireInside(slices.back().range, list.offset + list.length, source.size(), "a slice");
    }
    requireSeparate(slices);
    requireDistinct(slices);
    return slices;
}

/// The signature that the load commands give, relative to the image.
std::optional<FileRange> walkLoadCommands(PieceReader commands, const ImageHeader& image) {
    std::optional<FileRange> found;
    // Every command takes at least eight bytes of a bounded space, so a false count ends the walk early.
    for (std::uint32_t i = 0; i < image.commandCount; ++i) {
        ImageReader header(commands.next(kLoadCommandHeaderSize, "a load command"), image.form);
        const std::uint32_t command = header.u32("load command");
        const std::uint32_t size = header.u32("load command size");
        if (size < kLoadCommandHeaderSize) refuse("a load command is shorter than its header");
        if (command != kLoadCommandSignature) {
            commands.skip(size - kLoadCommandHeaderSize, "a load command");
            continue;
        }
        if (size != kSignatureCommandSize) refuse("the signature's load command has a wrong size");
        if (found) refuse("two load commands give a signature");
        ImageReader body(commands.next(size - kLoadCommandHeaderSize, "a load command"), image.form);
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
    return imageFormOf(start) || isUniversalMagic(start);
}

std::vector<ImageSlice> readSlices(const ByteSource& source) {
    const Data start = source.read(0, kUniversalHeaderSize);
    if (const auto universal = readUniversalHeader(start)) return readUniversal(source, *universal);
    const std::optional<ImageForm> form = imageFormOf(start);
    if (!form) refuse("not an executable image");
    ImageReader reader(start, *form);
    reader.skip(4, "magic");
    ImageSlice whole;
    whole.cpuType = reader.u32("CPU type");
    whole.range.length = source.size();
    return {whole};
}

ImageHeader readSliceHeader(const ByteSource& source, const ImageSlice& slice) {
    if (slice.range.length < kImageHeaderSize32) refuse("a slice is shorter than an image header");
    const auto header = readImageHeader(source.read(slice.range.offset, kImageHeaderSize32));
    if (!header) refuse("a slice is not an executable image");
    return *header;
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
    const ImageHeader header = readSliceHeader(source, slice);
    const FileRange commands = {header.form.headerSize(), header.commandsSize};
    requireInside(commands, 0, slice.range.length, "the list of load commands");

    std::optional<FileRange> signature = walkLoadCommands(
        PieceReader(source, {slice.range.offset + commands.offset, commands.length}), header);
    if (!signature || signature->length == 0) return std::nullopt;
    requireInside(*signature, commands.offset + commands.length, slice.range.length, "the signature");
    signature->offset += slice.range.offset;
    return signature;
}

}  // namespace pinwell::codesign
