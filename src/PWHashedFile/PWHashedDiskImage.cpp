#include "src/PWHashedFile/PWHashedDiskImage.h"

#include <algorithm>
#include <array>
#include <limits>

#include "foundation/byte_reader.h"
#include "foundation/process.h"
#include "src/PWHashedFile/synthetic_cdhash.h"
#include "src/cdhash_extract.h"
#include "src/messages.h"

namespace pinwell {

using foundation::ByteReader;
using foundation::ByteView;

namespace {

/// The least that a blob takes: its index entry and its header.
constexpr std::uint64_t kMinimumBlobFootprint = kBlobIndexEntrySize + kBlobHeaderSize;

// Whether `step` went through; a failure's reason goes to `report`.
template <class Step, class Report>
void attempt(Step&& step, Report&& report) {
    try {
        step();
    } catch (const files::FileHandleError& failure) {
        report(failure.what());
    }
}

}  // namespace

PWHashedDiskImage::PWHashedDiskImage(const URL& fileURL, const Platform& platform)
    : PWHashedFile(fileURL, platform) {
    if (!populateHeader()) setAppropriateExitCode(kExitNoInput);
}

bool PWHashedDiskImage::refuse(std::uint64_t offset, const char* rule) {
    fault_ = {offset, rule};
    return false;
}

bool PWHashedDiskImage::populateHeader() {
    noteState();
    const auto opened = platform().files.openForReading(*fileURL());
    if (!opened) {
        NoisyLog("Could not create file handle to %@. %@", *fileURL(), opened.error());
        NoisyLog("Could not get disk image header from %@. %@", fileURL()->lastPathComponent(),
                 opened.error());
        return refuse(0, "the file cannot be opened");
    }
    files::FileHandle& file = **opened;
    if (!readTrailer(file)) return false;
    const bool isSigned = csStart_ != 0 && csLength_ != 0;
    return (isSigned ? readSignature(file) : makeUpForMissingSignature()) && readBlobs();
}

// What cannot be read is only said here: the zeros in its place fail the next check, with a message of its
// own.
bool PWHashedDiskImage::readTrailer(files::FileHandle& file) {
    const std::string name = fileURL()->lastPathComponent();
    attempt([&] { origEOF_ = file.seekToEnd(); },
            [&](const char* reason) {
                NoisyLog("Could not get file size of %@. This should not have happened. %@", name, reason);
            });
    if (origEOF_ < kUDIFHeaderSize) {
        NoisyLog("%@ is too small (%llu bytes) to be a proper disk image", name, origEOF_);
        return refuse(0, "the file is too small for a disk image's trailer");
    }
    const std::uint64_t trailerStart = origEOF_ - kUDIFHeaderSize;
    attempt(
        [&] {
            file.seek(trailerStart);
            dmgHeader_.assign(file.read(kUDIFHeaderSize));
        },
        [&](const char* reason) {
            NoisyLog("Could read UDIF header of %@. This should not have happened. %@", name, reason);
        });
    if (!dmgHeader_.hasMagic()) {
        NoisyLog("Not a supported disk image format, %d", dmgHeader_.magicAsShown());
        return refuse(trailerStart, "the file does not end in a disk image's trailer");
    }
    if (dmgHeader_.version() != kUDIFVersion) {
        NoisyLog("%@ only supports version %d disk images while %@ is version %d.", foundation::processName(),
                 kUDIFVersion, name, dmgHeader_.version());
        return refuse(trailerStart + 4, "the trailer's version is not 4");
    }
    csStart_ = dmgHeader_.codeSignOffset();
    csLength_ = dmgHeader_.codeSignLength();
    return true;
}

bool PWHashedDiskImage::readSignature(files::FileHandle& file) {
    endOfDMGData_ = csStart_;
    NoisyLog("Codesign offset 0x%llx length: %llu", csStart_, csLength_);
    const std::uint64_t trailerStart = origEOF_ - kUDIFHeaderSize;
    const std::uint64_t fields = trailerStart + kUDIFCodeSignFieldsOffset;
    if (csLength_ > std::numeric_limits<std::uint64_t>::max() - csStart_)
        return refuse(fields, "the signature's offset and length are out of range");
    const std::uint64_t end = csStart_ + csLength_;
    if (end != trailerStart) {
        NoisyLog(
            "In a good disk image, the stored code signature end MUST match the UDIF header start. It "
            "currently "
            "doesn't. (%llu vs %llu)",
            end, trailerStart);
        return refuse(fields, "the signature does not end where the trailer begins");
    }
    if (csLength_ > codesign::kMaximumSuperBlobLength) return refuse(fields, "the signature is too long");
    attempt(
        [&] {
            file.seek(csStart_);
            superblob_ = file.read(csLength_);
        },
        [&](const char* reason) {
            NoisyLog("Could read code signature header of %@. This should not have happened. %@",
                     fileURL()->lastPathComponent(), reason);
        });
    return superblob_.size() == csLength_ || refuse(csStart_, "the signature cannot be read");
}

bool PWHashedDiskImage::makeUpForMissingSignature() {
    NoisyLog("Creating synthetic cdHash for unsigned disk image, %@. Humanity must endure.",
             fileURL()->lastPathComponent());
    std::uint32_t algorithm = 0;
    std::optional<Data> cdHash;
    const auto status = syntheticCDHashForURL(*fileURL(), platform(), &algorithm, &cdHash);
    if (status != codesign::kSuccess) {
        NoisyLog("synthetic cdHash generation failed. %d", status);
        return refuse(0, "no hash can be made up for the unsigned image");
    }
    csStart_ = endOfDMGData_ = origEOF_ - kUDIFHeaderSize;
    superblob_ = emptySuperblob();
    setDigestAlgorithm(algorithm);
    syntheticCDHash_ = std::move(cdHash);
    csLength_ = superblob_.size();
    return true;
}

bool PWHashedDiskImage::readBlobs() {
    std::array<std::byte, kSuperblobHeaderSize> header{};  // of a shorter superblob the rest is zero
    const ByteView start = ByteView(superblob_).first(std::min(superblob_.size(), header.size()));
    std::copy(start.begin(), start.end(), header.begin());
    ByteReader reader(header);
    if (reader.be32("superblob magic") != kSuperblobMagic) {
        NoisyLog("Not a supported code signature block, %d", ByteReader(header).le32("superblob magic"));
        return refuse(csStart_, "the superblob does not begin with its magic");
    }
    const std::uint32_t length = reader.be32("superblob length");
    numBlobs_ = reader.be32("superblob count");
    NoisyLog("Stored Codesign length: %u number of blobs: %d", length, numBlobs_);

    const std::uint64_t mostBlobs = csLength_ / kMinimumBlobFootprint;
    if (mostBlobs < numBlobs_) {
        NoisyLog("%tu blobs in %@ exceeds the maximum possible number of blobs, %d", mostBlobs,
                 fileURL()->lastPathComponent(), numBlobs_);
        return refuse(csStart_ + 8, "the superblob counts more blobs than it has room for");
    }
    if (csLength_ != length) {
        NoisyLog("The code signature block must be %llu bytes in length. However, it is %d.", csLength_,
                 length);
        return refuse(csStart_ + 4, "the superblob's length is not the one in the trailer");
    }
    blobs_ = orderedBlobSetForSuperBlob(superblob_, numBlobs_).value_or(BlobSet{});
    return blobs_.size() == numBlobs_ ||
           refuse(csStart_ + kSuperblobHeaderSize, "the blobs do not fill the superblob back to back");
}

std::optional<Data> PWHashedDiskImage::_ticketData() {
    std::optional<Data> ticket;
    for (const BlobRecord& record : blobs_) {
        if (slotTypeOf(record) != kTicketSlotType) continue;
        const ByteView blob = dataOf(record);
        ticket = foundation::toData(blob.subspan(std::min<std::size_t>(kBlobHeaderSize, blob.size())));
    }
    return ticket;
}

std::optional<Data> PWHashedDiskImage::_cdHash() {
    const foundation::Value properties = basicCodeProperties(*fileURL(), platform());
    if (const Data* hash = properties[kCDHashKey].data(); hash != nullptr) {
        NoisyLog("Props are %@", properties);
        setDigestAlgorithm(
            static_cast<std::uint32_t>(properties[kDigestAlgorithmKey].unsignedIntegerValue()));
        return *hash;
    }
    if (syntheticCDHash_) return syntheticCDHash_;

    std::uint32_t algorithm = 0;
    std::optional<Data> cdHash;
    const auto status = syntheticCDHashForURL(*fileURL(), platform(), &algorithm, &cdHash);
    if (status != codesign::kSuccess) {
        NoisyLog("Generating a synthetic cdHash for %@ failed. %d", fileURL()->lastPathComponent(), status);
        return std::nullopt;
    }
    setDigestAlgorithm(algorithm);
    return cdHash;
}

}  // namespace pinwell
