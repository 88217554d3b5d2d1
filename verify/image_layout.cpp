#include "verify/image_layout.h"

#include <algorithm>
#include <limits>

#include "base/byte_io.h"
#include "base/bytes.h"
#include "codesign/code_error.h"
#include "values/format.h"
#include "verify/check.h"
#include "verify/page_digest.h"

namespace pinwell::verify {

using base::ByteReader;
using codesign::ImageSlice;
using values::format;

namespace {

constexpr std::uint32_t kMagic32 = 0xFEEDFACE;
constexpr std::uint32_t kMagic64 = 0xFEEDFACF;
constexpr std::uint32_t kUniversalMagic32 = 0xCAFEBABE;
constexpr std::uint32_t kUniversalMagic64 = 0xCAFEBABF;
constexpr std::uint32_t kCommandSegment32 = 0x1;
constexpr std::uint32_t kCommandSegment64 = 0x19;
constexpr std::uint32_t kProtectionExecute = 4;
constexpr std::size_t kNameSize = 16;
constexpr std::size_t kUniversalHeaderSize = 8;

/// They are held whole. Very large programs have some 100 KiB.
constexpr std::uint32_t kMaximumLoadCommands = std::uint32_t{16} * 1024 * 1024;

/// Bytes that may follow a signature for alignment.
constexpr std::uint64_t kMaximumPadding = 16;

/// Reads numbers in the order and width of one image.
class ImageReader {
  public:
    ImageReader(ByteView bytes, bool isBigEndian, bool is64)
        : reader_(bytes), isBigEndian_(isBigEndian), is64_(is64) {}

    bool is64() const noexcept { return is64_; }
    std::uint32_t u32(const char* what) { return isBigEndian_ ? reader_.be32(what) : reader_.le32(what); }
    std::uint64_t word(const char* what) {
        if (!is64_) return u32(what);
        return isBigEndian_ ? reader_.be64(what) : reader_.le64(what);
    }
    void skip(std::uint64_t length, const char* what) { reader_.skip(length, what); }
    std::string name(const char* what) {
        const std::string text = base::toString(reader_.bytes(kNameSize, what));
        return text.substr(0, text.find('\0'));
    }
    ImageReader take(std::uint64_t length, const char* what) {
        return ImageReader(reader_.bytes(length, what), isBigEndian_, is64_);
    }

  private:
    ByteReader reader_;
    bool isBigEndian_;
    bool is64_;
};

// After the command's first eight bytes.
void readSegment(ImageReader body, ImageLayout& layout) {
    Segment segment;
    segment.name = body.name("segment name");
    body.word("segment address");
    body.word("segment size");
    segment.range.offset = body.word("segment offset");
    segment.range.length = body.word("segment length");
    const std::uint32_t most = body.u32("most protection");
    const std::uint32_t first = body.u32("first protection");
    segment.isExecutable = ((most | first) & kProtectionExecute) != 0;
    const std::uint32_t sections = body.u32("count of sections");
    body.skip(4, "segment flags");
    // Every section takes bytes of a bounded command, so a false count ends in a short read.
    for (std::uint32_t i = 0; i < sections; ++i) {
        const std::string name = body.name("section name");
        const std::string owner = body.name("section's segment");
        body.word("section address");
        const std::uint64_t length = body.word("section size");
        const std::uint32_t offset = body.u32("section offset");
        body.skip(body.is64() ? 28 : 24, "section");
        if (name == "__info_plist" && owner == "__TEXT") layout.propertyList = FileRange{offset, length};
    }
    layout.segments.push_back(std::move(segment));
}

struct ListedSlice {
    std::uint32_t cpuType = 0;
    std::uint32_t cpuSubtype = 0;
    FileRange range;
    std::uint32_t alignment = 0;  // as a power of two
    std::uint32_t spare = 0;
};

constexpr std::size_t lengthOfList(std::size_t count, bool is64) {
    return count * (is64 ? 32 : 20);
}

// readSlices() has checked that the list exists.
std::vector<ListedSlice> readList(const ByteSource& source, std::size_t count, bool is64) {
    const Data bytes = source.read(kUniversalHeaderSize, lengthOfList(count, is64));
    ByteReader reader(bytes);
    std::vector<ListedSlice> list(count);
    for (ListedSlice& slice : list) {
        slice.cpuType = reader.be32("CPU type");
        slice.cpuSubtype = reader.be32("CPU subtype");
        slice.range.offset = is64 ? reader.be64("slice offset") : reader.be32("slice offset");
        slice.range.length = is64 ? reader.be64("slice size") : reader.be32("slice size");
        slice.alignment = reader.be32("alignment");
        if (is64) slice.spare = reader.be32("spare");
    }
    return list;
}

void checkListedSlice(const ByteSource& source, const ListedSlice& listed, const std::string& place,
                      FailureList& failures) {
    const std::string at = place + ", " + sliceName(listed.cpuType);
    const ImageLayout layout = readImageLayout(source, {listed.cpuType, listed.cpuSubtype, listed.range});
    if (layout.cpuType != listed.cpuType || layout.cpuSubtype != listed.cpuSubtype)
        failures.add(Outcome::failed, at + ", entry in the list of slices",
                     format("CPU type 0x%08x, subtype 0x%08x", layout.cpuType, layout.cpuSubtype),
                     format("CPU type 0x%08x, subtype 0x%08x", listed.cpuType, listed.cpuSubtype));
    constexpr std::uint32_t kMaximumAlignment = 31;
    if (listed.alignment > kMaximumAlignment ||
        listed.range.offset % (std::uint64_t{1} << listed.alignment) != 0)
        failures.add(Outcome::failed, at + ", entry in the list of slices",
                     "an offset that has its alignment", format("offset %llu", listed.range.offset));
    if (listed.spare != 0)
        failures.add(Outcome::failed, at + ", entry in the list of slices", "a spare field of zero",
                     format("0x%08x", listed.spare));
}

}  // namespace

std::string sliceName(std::uint32_t cpuType) {
    switch (cpuType) {
        case codesign::kCpuType64Arm:
            return "64-bit ARM slice";
        case codesign::kCpuType64X86:
            return "64-bit x86 slice";
        default:
            return format("slice of CPU type 0x%08x", cpuType);
    }
}

ImageLayout readImageLayout(const ByteSource& source, const ImageSlice& slice) {
    constexpr std::size_t kHeader32 = 28;
    constexpr std::size_t kHeader64 = 32;
    if (slice.range.length < kHeader32) codesign::refuse("a slice is shorter than an image header");
    const Data start = source.read(slice.range.offset, kHeader32);
    const std::uint32_t big = ByteReader(start).be32("magic");
    const std::uint32_t little = ByteReader(start).le32("magic");
    const bool isBigEndian = big == kMagic32 || big == kMagic64;
    const bool is64 = big == kMagic64 || little == kMagic64;
    if (!isBigEndian && little != kMagic32 && little != kMagic64)
        codesign::refuse("a slice is not an executable image");

    ImageReader header(start, isBigEndian, is64);
    header.skip(4, "magic");
    ImageLayout layout;
    layout.cpuType = header.u32("CPU type");
    layout.cpuSubtype = header.u32("CPU subtype");
    layout.fileType = header.u32("file type");
    const std::uint32_t count = header.u32("count of load commands");
    const std::uint32_t size = header.u32("size of load commands");
    const std::size_t headerSize = is64 ? kHeader64 : kHeader32;
    if (size > kMaximumLoadCommands || slice.range.length < headerSize ||
        size > slice.range.length - headerSize)
        codesign::refuse("the load commands lie outside their place");

    const Data bytes = source.read(slice.range.offset + headerSize, size);
    ImageReader commands(bytes, isBigEndian, is64);
    for (std::uint32_t i = 0; i < count; ++i) {
        const std::uint32_t command = commands.u32("load command");
        const std::uint32_t length = commands.u32("load command size");
        if (length < 8) codesign::refuse("a load command is shorter than its header");
        const ImageReader body = commands.take(length - 8, "load command");
        if (command == (is64 ? kCommandSegment64 : kCommandSegment32)) readSegment(body, layout);
    }
    return layout;
}

bool isProgram(const ByteSource& source) {
    constexpr std::uint32_t kExecutable = 2;
    const std::vector<ImageSlice> slices = codesign::readSlices(source);
    return readImageLayout(source, codesign::preferredSlice(slices)).fileType == kExecutable;
}

void checkUniversalHeader(const ByteSource& source, const std::vector<ImageSlice>& slices,
                          const std::string& place, Section& section) {
    const Data start = source.read(0, kUniversalHeaderSize);
    const std::uint32_t magic = ByteReader(start).be32("magic");
    if (magic != kUniversalMagic32 && magic != kUniversalMagic64) return;

    FailureList failures(section, kImageStructure);
    const bool is64 = magic == kUniversalMagic64;
    std::vector<ListedSlice> list = readList(source, slices.size(), is64);
    std::sort(list.begin(), list.end(),
              [](const ListedSlice& a, const ListedSlice& b) { return a.range.offset < b.range.offset; });
    std::uint64_t covered = kUniversalHeaderSize + lengthOfList(slices.size(), is64);
    for (const ListedSlice& listed : list) {
        checkListedSlice(source, listed, place, failures);
        if (!isZero(source, {covered, listed.range.offset - covered}))
            failures.add(Outcome::failed,
                         format("%@, gap before the %@ (bytes %llu to %llu)", place,
                                sliceName(listed.cpuType), covered, listed.range.offset - 1),
                         "zeros", "other bytes");
        covered = listed.range.offset + listed.range.length;
    }
    if (covered != source.size())
        failures.add(Outcome::failed, format("%@, after the last slice (from byte %llu on)", place, covered),
                     "the end of the file", format("%llu more bytes", source.size() - covered));
    if (failures.count() == 0)
        section.pass(kImageStructure, place, format("%zu slices and no more", list.size()));
}

void checkBehindSignature(const ByteSource& source, const ImageSlice& slice, const ImageLayout& layout,
                          const FileRange& signature, const std::string& place, Section& section) {
    FailureList failures(section, kBehindSignature);
    const std::uint64_t begin = signature.offset - slice.range.offset;
    for (const Segment& segment : layout.segments) {
        if (!segment.isExecutable || segment.range.length == 0) continue;
        // The sum of the two numbers could overflow.
        const bool isBefore =
            segment.range.offset <= begin && segment.range.length <= begin - segment.range.offset;
        if (!isBefore)
            failures.add(Outcome::failed, place + ", segment " + segment.name,
                         "code that ends before the signature", "code in the signature or after it");
    }
    const std::uint64_t end = begin + signature.length;
    const FileRange rest{signature.offset + signature.length, slice.range.length - end};
    if (rest.length > kMaximumPadding || !isZero(source, rest))
        failures.add(Outcome::failed,
                     format("%@, after the signature (from byte %llu on)", place, rest.offset),
                     "the end of the image", format("%llu more bytes", rest.length));
    if (failures.count() == 0) section.pass(kBehindSignature, place, "nothing that can be executed");
}

}  // namespace pinwell::verify
