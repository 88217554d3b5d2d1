#include "src/PWHashedFile/PWHashedDiskImage.h"

#include <utility>

#include "foundation/value.h"
#include "src/PWHashedFile/held_ticket.h"
#include "src/PWHashedFile/synthetic_cdhash.h"
#include "src/cdhash_extract.h"
#include "src/messages.h"

namespace pinwell {

PWHashedDiskImage::PWHashedDiskImage(const URL& fileURL, const Platform& platform)
    : PWHashedFile(fileURL, platform) {
    if (!populateHeader()) setAppropriateExitCode(kExitNoInput);
}

bool PWHashedDiskImage::populateHeader() {
    noteState();
    const std::string name = fileURL()->lastPathComponent();
    const auto opened = platform().files.openForReading(*fileURL());
    if (!opened) {
        NoisyLog("Could not create file handle to %@. %@", *fileURL(), opened.error());
        NoisyLog("Could not get disk image header from %@. %@", name, opened.error());
        return signature_.refuse(0, "the file cannot be opened");
    }
    files::FileHandle& file = **opened;
    if (!readDiskImageTrailer(file, name, signature_)) return false;
    if (signature_.isSigned()) {
        endOfDMGData_ = signature_.csStart;
        if (!readDiskImageSuperblob(file, name, signature_)) return false;
    } else if (!makeUpForMissingSignature(name)) {
        return false;
    }
    return readDiskImageBlobs(name, signature_);
}

bool PWHashedDiskImage::makeUpForMissingSignature(const std::string& name) {
    NoisyLog("Creating synthetic cdHash for unsigned disk image, %@. Humanity must endure.", name);
    std::uint32_t algorithm = 0;
    std::optional<Data> cdHash;
    const auto status = syntheticCDHashForURL(*fileURL(), platform(), &algorithm, &cdHash);
    if (status != codesign::kSuccess) {
        NoisyLog("synthetic cdHash generation failed. %d", status);
        return signature_.refuse(0, "no hash can be made up for the unsigned image");
    }
    signature_.csStart = endOfDMGData_ = signature_.fileSize - kUDIFHeaderSize;
    signature_.superblob = emptySuperblob();
    setDigestAlgorithm(algorithm);
    syntheticCDHash_ = std::move(cdHash);
    signature_.csLength = signature_.superblob.size();
    return true;
}

std::optional<Data> PWHashedDiskImage::_ticketData() {
    const BlobRecord* const blob = ticketBlobOf(signature_.blobs);
    if (blob == nullptr) return std::nullopt;
    const foundation::ByteView ticket = ticketIn(*blob);
    return foundation::toData(ticket.first(heldOfTicket(ticket.size())));
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
