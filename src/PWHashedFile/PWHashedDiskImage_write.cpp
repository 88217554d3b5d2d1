// Adds and removes a disk image's ticket: writes a new superblob and the trailer at the end of the image's
// data.
#include <cerrno>
#include <limits>
#include <new>
#include <utility>

#include "foundation/bytes.h"
#include "foundation/process.h"
#include "foundation/url.h"
#include "src/PWHashedFile/PWHashedDiskImage.h"
#include "src/messages.h"

namespace pinwell {

using foundation::ByteView;

bool PWHashedDiskImage::_writeNewTicketDataFromURL(const std::optional<URL>& source, const URL& target,
                                                   bool deleteExisting, ErrorOut error) {
    const std::string name = target.lastPathComponent();
    std::optional<Error> held;

    // Empty if the ticket is deleted; after the next check only then.
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
        foundation::SparseBuffer superblob = superblobWithTicket(signature_.blobs, ticket, kUDIFHeaderSize);
        if (superblob.size() != 0 && !writeSignature(std::move(superblob), target, deleteExisting, held))
            return failedToWrite(held, error);
    } catch (const std::bad_alloc&) {
        return failedToWrite(Error::posix(ENOMEM, target.path()), error);
    }
    setAppropriateExitCode(kExitOK);
    return true;
}

// The buffer has the superblob, and space for the trailer after it.
bool PWHashedDiskImage::writeSignature(foundation::SparseBuffer signatureAndTrailer, const URL& target,
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
    } catch (const files::FileHandleError& failure) {
        NoisyLog("Fatal error while %@ ticket to %@. %@.",
                 deleteExisting ? "deleting existing" : "writing new", target.path(), failure.what());
        return false;
    }
}

// If the write to the image is interrupted, this file has the bytes to repair it.
void PWHashedDiskImage::saveDebugCopy(ByteView signatureAndTrailer, std::optional<Error>& held) const {
    files::FileManager& files = platform().files;
    const URL copy = files.temporaryDirectory().appendingPathComponent(
        foundation::format("%@.dmgData", foundation::globallyUniqueString()));
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
