#include "formats/disk_image.h"

#include <algorithm>
#include <array>
#include <limits>

#include "base/byte_io.h"
#include "runtime/process.h"

namespace pinwell {
namespace {

using base::ByteReader;
using base::ByteView;

constexpr std::size_t kUDIFVersionOffset = 4;
constexpr std::size_t kUDIFHeaderSizeOffset = 8;
constexpr std::size_t kDataForkOffset = 24;
constexpr std::size_t kDataForkLengthOffset = 32;
constexpr std::size_t kDataForkChecksumOffset = 80;
constexpr std::size_t kXMLOffset = 216;
constexpr std::size_t kXMLLengthOffset = 224;
constexpr std::size_t kCodeSignLengthOffset = 304;
constexpr std::size_t kMasterChecksumOffset = 352;
constexpr std::size_t kChecksumSize = 136;

ByteReader trailerFieldAt(ByteView header, std::size_t offset) {
    ByteReader reader(header);
    reader.seek(offset, "UDIF header field");
    return reader;
}

// The minimum size of a blob: its index entry and its header.
constexpr std::uint64_t kMinimumBlobFootprint = kBlobIndexEntrySize + kBlobHeaderSize;

// Takes `step`. If it fails to read, `report` gets the reason, and the run goes on.
template <class Step, class Report>
void attempt(Step&& step, Report&& report) {
    try {
        step();
    } catch (const base::ReadFailure& failure) {
        report(failure.what());
    }
}

}  // namespace

bool UDIFFileHeader::assign(ByteView bytes) {
    if (bytes.size() != bytes_.size()) return false;
    std::copy(bytes.begin(), bytes.end(), bytes_.begin());
    return true;
}

bool UDIFFileHeader::hasMagic() const {
    return ByteReader(bytes_).be32("fUDIFSignature") == kUDIFMagic;
}

std::uint32_t UDIFFileHeader::magicAsShown() const {
    return ByteReader(bytes_).le32("fUDIFSignature");
}

std::uint32_t UDIFFileHeader::version() const {
    return trailerFieldAt(bytes_, kUDIFVersionOffset).be32("fUDIFVersion");
}

std::uint32_t UDIFFileHeader::headerSize() const {
    return trailerFieldAt(bytes_, kUDIFHeaderSizeOffset).be32("fUDIFHeaderSize");
}

std::uint64_t UDIFFileHeader::dataForkOffset() const {
    return trailerFieldAt(bytes_, kDataForkOffset).be64("fUDIFDataForkOffset");
}

std::uint64_t UDIFFileHeader::dataForkLength() const {
    return trailerFieldAt(bytes_, kDataForkLengthOffset).be64("fUDIFDataForkLength");
}

std::uint64_t UDIFFileHeader::xmlOffset() const {
    return trailerFieldAt(bytes_, kXMLOffset).be64("fUDIFXMLOffset");
}

std::uint64_t UDIFFileHeader::xmlLength() const {
    return trailerFieldAt(bytes_, kXMLLengthOffset).be64("fUDIFXMLLength");
}

ByteView UDIFFileHeader::dataForkChecksum() const {
    return bytes().subspan(kDataForkChecksumOffset, kChecksumSize);
}

ByteView UDIFFileHeader::masterChecksum() const {
    return bytes().subspan(kMasterChecksumOffset, kChecksumSize);
}

std::uint64_t UDIFFileHeader::codeSignOffset() const {
    return trailerFieldAt(bytes_, kUDIFCodeSignFieldsOffset).be64("fUDIFCodeSignOffset");
}

std::uint64_t UDIFFileHeader::codeSignLength() const {
    return trailerFieldAt(bytes_, kCodeSignLengthOffset).be64("fUDIFCodeSignLength");
}

void UDIFFileHeader::setCodeSign(std::uint64_t offset, std::uint64_t length) {
    static_assert(kCodeSignLengthOffset == kUDIFCodeSignFieldsOffset + sizeof offset);
    const auto fields = base::ByteWriter().be64(offset).be64(length).data();
    std::copy(fields.begin(), fields.end(), bytes_.begin() + kUDIFCodeSignFieldsOffset);
}

bool DiskImageSignature::refuse(std::uint64_t offset, const char* rule) {
    fault = {offset, rule};
    return false;
}

// A read error is only reported here: the zeros instead of the bytes fail the next check, with its own
// message.
bool readDiskImageTrailer(const base::ByteSource& file, const std::string& name, DiskImageSignature& into,
                          const Diagnostics& diagnostics) {
    attempt([&] { into.fileSize = file.size(); },
            [&](const char* reason) {
                diagnostics.note("Could not get file size of %@. This should not have happened. %@", name,
                                 reason);
            });
    if (into.fileSize < kUDIFHeaderSize) {
        diagnostics.note("%@ is too small (%llu bytes) to be a proper disk image", name, into.fileSize);
        return into.refuse(0, "the file is too small for a disk image's trailer");
    }
    const std::uint64_t trailerStart = into.fileSize - kUDIFHeaderSize;
    attempt([&] { into.trailer.assign(file.readUpTo(trailerStart, kUDIFHeaderSize)); },
            [&](const char* reason) {
                diagnostics.note("Could read UDIF header of %@. This should not have happened. %@", name,
                                 reason);
            });
    if (!into.trailer.hasMagic()) {
        diagnostics.note("Not a supported disk image format, %d", into.trailer.magicAsShown());
        return into.refuse(trailerStart, "the file does not end in a disk image's trailer");
    }
    if (into.trailer.version() != kUDIFVersion) {
        diagnostics.note("%@ only supports version %d disk images while %@ is version %d.",
                         runtime::processName(), kUDIFVersion, name, into.trailer.version());
        return into.refuse(trailerStart + 4, "the trailer's version is not 4");
    }
    into.csStart = into.trailer.codeSignOffset();
    into.csLength = into.trailer.codeSignLength();
    return true;
}

bool readDiskImageSuperblob(const base::ByteSource& file, const std::string& name, DiskImageSignature& into,
                            const Diagnostics& diagnostics) {
    diagnostics.note("Codesign offset 0x%llx length: %llu", into.csStart, into.csLength);
    const std::uint64_t trailerStart = into.fileSize - kUDIFHeaderSize;
    const std::uint64_t fields = trailerStart + kUDIFCodeSignFieldsOffset;
    if (into.csLength > std::numeric_limits<std::uint64_t>::max() - into.csStart)
        return into.refuse(fields, "the signature's offset and length are out of range");
    const std::uint64_t end = into.csStart + into.csLength;
    if (end != trailerStart) {
        diagnostics.note(
            "In a good disk image, the stored code signature end MUST match the UDIF header start. It "
            "currently doesn't. (%llu vs %llu)",
            end, trailerStart);
        return into.refuse(fields, "the signature does not end where the trailer begins");
    }
    const bool canBeSaid = into.csLength <= std::numeric_limits<std::uint32_t>::max();
    const std::uint64_t wanted = canBeSaid ? into.csLength : kSuperblobHeaderSize;
    attempt([&] { into.superblob = file.readSharedUpTo(into.csStart, wanted); },
            [&](const char* reason) {
                diagnostics.note("Could read code signature header of %@. This should not have happened. %@",
                                 name, reason);
            });
    return into.superblob.size() == wanted || into.refuse(into.csStart, "the signature cannot be read");
}

bool readDiskImageBlobs(const std::string& name, DiskImageSignature& into, const Diagnostics& diagnostics) {
    std::array<std::byte, kSuperblobHeaderSize> header{};  // for a shorter superblob the rest is zero
    const ByteView start = into.superblob.view().first(std::min(into.superblob.size(), header.size()));
    std::copy(start.begin(), start.end(), header.begin());
    ByteReader reader(header);
    const SuperblobHeader stored = readSuperblobHeader(reader);
    if (stored.magic != kSuperblobMagic) {
        diagnostics.note("Not a supported code signature block, %d",
                         ByteReader(header).le32("superblob magic"));
        return into.refuse(into.csStart, "the superblob does not begin with its magic");
    }
    const std::uint32_t length = stored.length;
    into.numBlobs = stored.count;
    diagnostics.note("Stored Codesign length: %u number of blobs: %d", length, into.numBlobs);

    const std::uint64_t mostBlobs = into.csLength / kMinimumBlobFootprint;
    if (mostBlobs < into.numBlobs) {
        diagnostics.note("%tu blobs in %@ exceeds the maximum possible number of blobs, %d", mostBlobs, name,
                         into.numBlobs);
        return into.refuse(into.csStart + 8, "the superblob counts more blobs than it has room for");
    }
    if (into.csLength != length) {
        diagnostics.note("The code signature block must be %llu bytes in length. However, it is %d.",
                         into.csLength, length);
        return into.refuse(into.csStart + 4, "the superblob's length is not the one in the trailer");
    }
    into.blobs = orderedBlobSetForSuperBlob(into.superblob, into.numBlobs, diagnostics).value_or(BlobSet{});
    return into.blobs.size() == into.numBlobs ||
           into.refuse(into.csStart + kSuperblobHeaderSize,
                       "the blobs do not fill the superblob back to back");
}

const BlobRecord* ticketBlobOf(const BlobSet& blobs) {
    const auto found = std::find_if(blobs.rbegin(), blobs.rend(), [](const BlobRecord& record) {
        return record.slotType == kTicketSlotType;
    });
    return found == blobs.rend() ? nullptr : &*found;
}

ByteView ticketIn(const BlobRecord& blob) {
    return blob.data.subspan(std::min<std::size_t>(kBlobHeaderSize, blob.data.size()));
}

}  // namespace pinwell
