#include "codesign/executable_image.h"

#include <algorithm>

#include "codesign/code_error.h"
#include "foundation/byte_reader.h"

namespace pinwell::codesign {

using foundation::ByteReader;

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

/// Reads 32-bit numbers in the order of one image.
class OrderedReader {
  public:
    OrderedReader(ByteView bytes, bool bigEndian) : reader_(bytes), bigEndian_(bigEndian) {}

    std::uint32_t u32(std::string_view what) { return bigEndian_ ? reader_.be32(what) : reader_.le32(what); }
    void skip(std::uint64_t length, std::string_view what) { reader_.skip(length, what); }
    OrderedReader take(std::uint64_t length, std::string_view what) {
        return OrderedReader(reader_.bytes(length, what), bigEndian_);
    }

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
    std::sort(ranges.begin(), ranges.end(),
              [](const FileRange& a, const FileRange& b) { return a.offset < b.offset; });
    const auto overlap = std::adjacent_find(
        ranges.begin(), ranges.end(),
        [](const FileRange& a, const FileRange& b) { return b.offset - a.offset < a.length; });
    if (overlap != ranges.end()) refuse("slices overlap");
}

std::vector<ImageSlice> readUniversal(const ByteSource& source) {
    const Data start = source.read(0, kUniversalHeaderSize);
    ByteReader header(start);
    const bool is64 = header.be32("magic") == kUniversalMagic64;
    const std::uint32_t count = header.be32("slice count");
    if (count == 0 || count > kMaximumSlices) refuse("unlikely number of slices");

    const std::size_t listSize = count * (is64 ? kSliceEntrySize64 : kSliceEntrySize32);
    const Data list = source.read(kUniversalHeaderSize, listSize);
    ByteReader entries(list, kUniversalHeaderSize);
    std::vector<ImageSlice> slices;
    for (std::uint32_t i = 0; i < count; ++i) {
        ImageSlice slice;
        slice.cpuType = entries.be32("CPU type");
        entries.skip(4, "CPU subtype");
        slice.range.offset = is64 ? entries.be64("slice offset") : entries.be32("slice offset");
        slice.range.length = is64 ? entries.be64("slice size") : entries.be32("slice size");
        entries.skip(is64 ? 8 : 4, "slice alignment");
        requireInside(slice.range, kUniversalHeaderSize + listSize, source.size(), "a slice");
        slices.push_back(slice);
    }
    requireSeparate(slices);
    return slices;
}

/// The signature that the load commands give, relative to the image.
std::optional<FileRange> walkLoadCommands(OrderedReader commands, std::uint32_t count) {
    std::optional<FileRange> found;
    // Every command takes eight bytes of a bounded space at least, so a count that lies ends the walk early.
    for (std::uint32_t i = 0; i < count; ++i) {
        const std::uint32_t command = commands.u32("load command");
        const std::uint32_t size = commands.u32("load command size");
        if (size < kLoadCommandHeaderSize) refuse("a load command is shorter than its header");
        OrderedReader body = commands.take(size - kLoadCommandHeaderSize, "load command");
        if (command != kLoadCommandSignature) continue;
        if (size != kSignatureCommandSize) refuse("the signature's load command has a wrong size");
        if (found) refuse("two load commands give a signature");
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
    return {ImageSlice{reader.u32("CPU type"), FileRange{0, source.size()}}};
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
    if (size > kMaximumLoadCommandsSize) refuse("too many load commands");
    const FileRange commands = {magic->is64 ? kThinHeaderSize64 : kThinHeaderSize32, size};
    requireInside(commands, 0, slice.range.length, "the list of load commands");

    const Data bytes = source.read(slice.range.offset + commands.offset, size);
    std::optional<FileRange> signature = walkLoadCommands(OrderedReader(bytes, magic->bigEndian), count);
    if (!signature || signature->length == 0) return std::nullopt;
    requireInside(*signature, commands.offset + commands.length, slice.range.length, "the signature");
    signature->offset += slice.range.offset;
    return signature;
}

}  // namespace pinwell::codesign
