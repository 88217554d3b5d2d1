#include "src/PWHashedFile/PWHashedDiskImage.h"

#include <cerrno>
#include <limits>
#include <new>
#include <utility>

#include "formats/tm_ticket.h"
#include "runtime/process.h"
#include "src/cdhash_extract.h"
#include "src/messages.h"
#include "values/value.h"

namespace pinwell {

using base::ByteView;
using base::Result;
using codesign::SigningInformation;
using codesign::Status;
using values::Array;
using values::Dictionary;
using values::Value;

namespace {

constexpr std::string_view kIdentifier = "ADHOC";

template <class Element>
Array arrayOf(const std::vector<Element>& elements) {
    return Array(elements.begin(), elements.end());
}

// For the verbose dump: missing values have no entry.
Dictionary dictionaryOf(const SigningInformation& information) {
    Dictionary dictionary;
    const auto store = [&](std::string_view key, const auto& value) {
        if (value) dictionary.emplace(key, Value(*value));
    };
    dictionary.emplace("cdhashes", arrayOf(information.cdHashes));
    dictionary.emplace("digest-algorithms", arrayOf(information.digestAlgorithms));
    store("unique", information.unique);
    store("digest-algorithm", information.digestAlgorithm);
    store("flags", information.flags);
    store("identifier", information.identifier);
    store("team-identifier", information.teamIdentifier);
    store("secure-timestamp", information.secureTimestamp);
    return dictionary;
}

Status statusOf(const Error& error) {
    return error.statusOr(codesign::kInvalidSignature);
}

// Signs `code` in memory and attaches that signature to it.
Result<void> signDetached(const codesign::CodeSigningService& service, codesign::StaticCode& code) {
    codesign::SignerParameters parameters;
    parameters.identifier = kIdentifier;
    parameters.detachedSignature = std::make_shared<Data>();
    parameters.digestAlgorithm = codesign::DigestType::sha256;

    const auto signer = service.makeSigner(parameters, codesign::kSignOpaque);
    if (!signer) {
        NoisyLog("Unable to create signer reference. %@", signer.error());
        return signer.error();
    }
    if (auto signing = service.addSignature(**signer, code, 0); !signing) {
        NoisyLog("Unable to add signer to code reference. %@", signing.error());
        return signing;
    }
    auto attachment = service.setDetachedSignature(code, *parameters.detachedSignature, 0);
    if (!attachment) NoisyLog("Unable to add detached signature to code reference. %@", attachment.error());
    return attachment;
}

}  // namespace

Status syntheticCDHashForURL(const values::URL& fileURL, const Platform& platform,
                             std::uint32_t* digestAlgorithm, std::optional<Data>* cdHash) {
    if (digestAlgorithm == nullptr && cdHash == nullptr) return codesign::kParameterError;
    const codesign::CodeSigningService& service = platform.codeSigning;

    const auto code = service.staticCode(fileURL, 0);
    if (!code || *code == nullptr) {
        const Error error = code ? Error::osStatus(codesign::kSuccess) : code.error();
        NoisyLog("Unable to create for %@: %@", fileURL.lastPathComponent(), error);
        return code ? codesign::kSuccess : statusOf(error);
    }
    if (const auto signing = signDetached(service, **code); !signing) return statusOf(signing.error());

    const auto found = service.signingInformation(**code, codesign::kSigningInformation);
    if (!found || !*found) {
        const Error error = found ? Error::osStatus(codesign::kSuccess) : found.error();
        NoisyLog("Could not get signing information. %@", error);
        return found ? codesign::kSuccess : statusOf(error);
    }
    const std::optional<SigningInformation>& information = *found;

    const auto& algorithms = information->digestAlgorithms;
    if (algorithms.empty() || algorithms.size() != information->cdHashes.size()) {
        // Not a failure: the caller goes on and notices the missing cdhash.
        NoisyLog("Could not get newly minted CD hash for %@.", fileURL.lastPathComponent());
        return codesign::kSuccess;
    }
    if (digestAlgorithm != nullptr) *digestAlgorithm = algorithms.front();
    if (cdHash != nullptr) *cdHash = information->cdHashes.front();
    NoisyLog("Signing information is %@", dictionaryOf(*information));
    return codesign::kSuccess;
}

PWHashedDiskImage::PWHashedDiskImage(const URL& fileURL, const Platform& platform)
    : PWHashedFile(fileURL, platform) {
    if (!populateHeader()) setAppropriateExitCode(kExitNoInput);
}

bool PWHashedDiskImage::populateHeader() {
    noteState();
    const Diagnostics diagnostics = noisyDiagnostics();
    const std::string name = fileURL()->lastPathComponent();
    const auto opened = platform().files.openForReading(*fileURL());
    if (!opened) {
        NoisyLog("Could not create file handle to %@. %@", *fileURL(), opened.error());
        NoisyLog("Could not get disk image header from %@. %@", name, opened.error());
        return signature_.refuse(0, "the file cannot be opened");
    }
    const base::ByteSource& file = **opened;
    if (!readDiskImageTrailer(file, name, signature_, diagnostics)) return false;
    if (signature_.isSigned()) {
        endOfDMGData_ = signature_.csStart;
        if (!readDiskImageSuperblob(file, name, signature_, diagnostics)) return false;
    } else if (!makeUpForMissingSignature(name)) {
        return false;
    }
    return readDiskImageBlobs(name, signature_, diagnostics);
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
    const base::ByteView ticket = ticketIn(*blob);
    return base::toData(ticket.first(heldOfTicket(ticket.size())));
}

std::optional<Data> PWHashedDiskImage::_cdHash() {
    const values::Value properties = basicCodeProperties(*fileURL(), platform());
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

// Writing: a new superblob and the trailer, at the end of the image's data.

bool PWHashedDiskImage::_writeNewTicketDataFromURL(const std::optional<URL>& source, const URL& target,
                                                   bool deleteExisting, ErrorOut error) {
    const std::string name = target.lastPathComponent();
    std::optional<Error> held;

    // Empty for a deletion. The next check refuses an empty ticket to attach, so from there on empty means a
    // deletion.
    const Data ticket = deleteExisting ? Data{} : readTicket(source, held);
    const bool fitsABlob = !ticket.empty() && ticket.size() <= std::numeric_limits<std::uint32_t>::max();
    if (!deleteExisting && !fitsABlob) return refuseNewTicket(target, held, error);
    if (deleteExisting && !ticketData()) {
        NoisyLog("Cannot delete an existing ticket in %@ that doesn't exist.", name);
        return failedToWrite(held, error);
    }

    if (!deleteExisting && !hasRoomForTicket(signature_.blobs, ticket))
        return refuseNewTicket(target, Error::posix(EFBIG, target.path()), error);
    try {
        base::SparseBuffer superblob =
            superblobWithTicket(signature_.blobs, ticket, kUDIFHeaderSize, noisyDiagnostics());
        if (superblob.size() != 0 && !writeSignature(std::move(superblob), target, deleteExisting, held))
            return failedToWrite(held, error);
    } catch (const std::bad_alloc&) {
        return failedToWrite(Error::posix(ENOMEM, target.path()), error);
    }
    setAppropriateExitCode(kExitOK);
    return true;
}

// The buffer has the superblob, and space for the trailer after it.
bool PWHashedDiskImage::writeSignature(base::SparseBuffer signatureAndTrailer, const URL& target,
                                       bool deleteExisting, std::optional<Error>& held) {
    const std::size_t length = signatureAndTrailer.size() - kUDIFHeaderSize;
    signature_.trailer.setCodeSign(signature_.csStart, length);
    signatureAndTrailer.put(length, signature_.trailer.bytes());
    saveDebugCopy(signatureAndTrailer.view(), held);

    const std::string name = target.lastPathComponent();
    const auto opened = platform().files.openForUpdating(target);
    if (!opened) {
        held = opened.error();
        NoisyLog("All that work and I can't open %@ for writing.", name);
        return false;
    }
    try {
        writeAtEndOfData(**opened, signatureAndTrailer.view(), name);
        return true;
    } catch (const base::FileFailure& failure) {
        NoisyLog("Fatal error while %@ ticket to %@. %@.",
                 deleteExisting ? "deleting existing" : "writing new", target.path(), failure.what());
        return false;
    }
}

// If the write to the image is interrupted, this file has the bytes to repair it.
void PWHashedDiskImage::saveDebugCopy(ByteView signatureAndTrailer, std::optional<Error>& held) const {
    files::FileManager& files = platform().files;
    const URL copy = files.temporaryDirectory().appendingPathComponent(
        values::format("%@.dmgData", runtime::globallyUniqueString()));
    const auto saved = files.writeFile(signatureAndTrailer, copy, files::FileManager::Writing::plain);
    if (!saved) {
        held = saved.error();
        return;
    }
    NoisyLog("A copy of the new disk image blobs and headers has been saved to %@. Enjoy.", copy.path());
}

void PWHashedDiskImage::writeAtEndOfData(files::FileHandle& file, ByteView signatureAndTrailer,
                                         const std::string& name) const {
    file.seek(endOfDMGData_);
    if (signature_.fileSize < endOfDMGData_ + signatureAndTrailer.size())
        file.reserve(signatureAndTrailer.size());
    file.write(signatureAndTrailer);
    const std::uint64_t end = file.position();
    if (signature_.fileSize > end) {
        NoisyLog("Truncating %@ from to %llu bytes to %llu bytes.", name, signature_.fileSize, end);
        file.truncate(end);
    }
    file.synchronize();
    file.close();
}

}  // namespace pinwell
