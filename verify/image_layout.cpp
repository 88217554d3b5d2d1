#include "image_layout.h"

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

constexpr std::uint32_t kProtectionExecute = 4;
constexpr std::size_t kNameSize = 16;

/// They are held whole. Very large programs have some 100 KiB.
constexpr std::uint32_t kMaximumLoadCommands = std::uint32_t{16} * 1024 * 1024;

/// Bytes that may follow a signature for alignment.
constexpr std::uint64_t kMaximumPadding = 16;

std::string nameIn(ImageReader& reader, const char* what) {
    const std::string text = base::toString(reader.bytes(kNameSize, what));
    return text.substr(0, text.find('\0'));
}

// After the command's first eight bytes.
void readSegment(ImageReader body, ImageLayout& layout) {
    Segment segment;
    segment.name = nameIn(body, "segment name");
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
        const std::string name = nameIn(body, "section name");
        const std::string owner = nameIn(body, "section's segment");
        body.word("section address");
        const std::uint64_t length = body.word("section size");
        const std::uint32_t offset = body.u32("section offset");
        body.skip(body.is64() ? 28 : 24, "section");
        if (name == "__info_plist" && owner == "__TEXT") layout.propertyList = FileRange{offset, length};
    }
    layout.segments.push_back(std::move(segment));
}

// readSlices() has found `count` slices in the list.
std::vector<UniversalEntry> readList(const ByteSource& source, const UniversalHeader& header,
                                     std::size_t count) {
    const Data bytes = source.read(kUniversalHeaderSize, count * header.entrySize());
    ByteReader reader(bytes);
    std::vector<UniversalEntry> list;
    for (std::size_t i = 0; i < count; ++i)
        list.push_back(readUniversalEntry(reader.bytes(header.entrySize(), "slice"), header));
    return list;
}

void checkListedSlice(const ByteSource& source, const UniversalEntry& listed, const std::string& place,
                      FailureList& failures) {
    const std::string at = place + ", " + sliceName(listed.cpuType);
    const ImageLayout layout =
        readImageLayout(source, {listed.cpuType, listed.cpuSubtype, {listed.offset, listed.length}});
    if (layout.cpuType != listed.cpuType || layout.cpuSubtype != listed.cpuSubtype)
        failures.add(Outcome::failed, at + ", entry in the list of slices",
                     format("CPU type 0x%08x, subtype 0x%08x", layout.cpuType, layout.cpuSubtype),
                     format("CPU type 0x%08x, subtype 0x%08x", listed.cpuType, listed.cpuSubtype));
    constexpr std::uint32_t kMaximumAlignment = 31;
    if (listed.alignment > kMaximumAlignment || listed.offset % (std::uint64_t{1} << listed.alignment) != 0)
        failures.add(Outcome::failed, at + ", entry in the list of slices",
                     "an offset that has its alignment", format("offset %llu", listed.offset));
    if (listed.spare != 0)
        failures.add(Outcome::failed, at + ", entry in the list of slices", "a spare field of zero",
                     format("0x%08x", listed.spare));
}

}  // namespace

std::string sliceName(std::uint32_t cpuType) {
    switch (cpuType) {
        case kCpuType64Arm:
            return "64-bit ARM slice";
        case kCpuType64X86:
            return "64-bit x86 slice";
        default:
            return format("slice of CPU type 0x%08x", cpuType);
    }
}

ImageLayout readImageLayout(const ByteSource& source, const ImageSlice& slice) {
    const ImageHeader header = codesign::readSliceHeader(source, slice);
    ImageLayout layout;
    layout.cpuType = header.cpuType;
    layout.cpuSubtype = header.cpuSubtype;
    layout.fileType = header.fileType;
    const std::size_t headerSize = header.form.headerSize();
    if (header.commandsSize > kMaximumLoadCommands || slice.range.length < headerSize ||
        header.commandsSize > slice.range.length - headerSize)
        codesign::refuse("the load commands lie outside their place");

    const Data bytes = source.read(slice.range.offset + headerSize, header.commandsSize);
    ImageReader commands(bytes, header.form);
    for (std::uint32_t i = 0; i < header.commandCount; ++i) {
        const std::uint32_t command = commands.u32("load command");
        const std::uint32_t length = commands.u32("load command size");
        if (length < kLoadCommandHeaderSize) codesign::refuse("a load command is shorter than its header");
        const ImageReader body = commands.take(length - kLoadCommandHeaderSize, "load command");
        if (command == (header.form.is64 ? kLoadCommandSegment64 : kLoadCommandSegment32))
            readSegment(body, layout);
    }
    return layout;
}

bool isProgram(const ByteSource& source) {
    const std::vector<ImageSlice> slices = codesign::readSlices(source);
    return readImageLayout(source, codesign::preferredSlice(slices)).fileType == kFileTypeExecutable;
}

void checkUniversalHeader(const ByteSource& source, const std::vector<ImageSlice>& slices,
                          const std::string& place, Section& section) {
    const auto header = readUniversalHeader(source.read(0, kUniversalHeaderSize));
    if (!header) return;

    FailureList failures(section, kImageStructure);
    std::vector<UniversalEntry> list = readList(source, *header, slices.size());
    std::sort(list.begin(), list.end(),
              [](const UniversalEntry& a, const UniversalEntry& b) { return a.offset < b.offset; });
    std::uint64_t covered = kUniversalHeaderSize + slices.size() * header->entrySize();
    for (const UniversalEntry& listed : list) {
        checkListedSlice(source, listed, place, failures);
        if (!isZero(source, {covered, listed.offset - covered}))
            failures.add(Outcome::failed,
                         format("%@, gap before the %@ (bytes %llu to %llu)", place,
                                sliceName(listed.cpuType), covered, listed.offset - 1),
                         "zeros", "other bytes");
        covered = listed.offset + listed.length;
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
