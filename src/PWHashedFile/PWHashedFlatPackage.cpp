// The only file of the tool that knows the archive library.
#include "src/PWHashedFile/PWHashedFlatPackage.h"

#include <xar/xar.h>

#include <cstdlib>
#include <memory>
#include <span>
#include <string_view>
#include <type_traits>
#include <utility>

#include "base/handle.h"
#include "runtime/process.h"
#include "src/messages.h"

namespace pinwell {

using base::ByteView;

namespace {

constexpr std::int32_t kReading = 0;
constexpr std::string_view kSignatureType = "CMS";

using Archive = base::Handle<std::remove_pointer_t<xar_t>, xar_close>;

struct Free {
    void operator()(std::uint8_t* bytes) const noexcept { std::free(bytes); }  // NOLINT(*-no-malloc)
};
using CopiedBytes = std::unique_ptr<std::uint8_t, Free>;

xar_signature_t firstCMSSignature(xar_t archive) {
    for (xar_signature_t signature = xar_signature_first(archive); signature != nullptr;
         signature = xar_signature_next(signature)) {
        const char* const type = xar_signature_type(signature);  // null if the archive has none
        const std::string_view text = type == nullptr ? "" : type;
        NoisyLog("Sig Type is %s. Length is %lu", type, text.size());
        if (text == kSignatureType) return signature;
    }
    return nullptr;
}

// By the length of the digest, because the archive's own name for its algorithm is not read.
std::uint32_t algorithmOfSize(const char* size) {
    constexpr int kDecimal = 10;
    switch (std::strtol(size, nullptr, kDecimal)) {
        case 20:
            return 1;
        case 32:
            return 2;
        default:
            return 0;
    }
}

// To read the archive's own properties, the library takes the archive's handle as a file handle.
const char* checksumSize(xar_t archive) {
    const char* size = nullptr;
    const auto status = xar_prop_get(reinterpret_cast<xar_file_t>(archive), "checksum/size", &size);
    return status == 0 && size != nullptr && *size != '\0' ? size : nullptr;
}

}  // namespace

std::optional<Data> PWHashedFlatPackage::_cdHash() {
    noteState();
    const Archive archive(xar_open(fileURL()->path().c_str(), kReading));
    if (!archive) return std::nullopt;

    const xar_signature_t signature = firstCMSSignature(archive.get());
    if (signature == nullptr) {
        NoisyLog("Could not find an appropriate \"code signature\" in the %@ installer package.", name());
        return std::nullopt;
    }
    std::uint8_t* copy = nullptr;
    std::uint32_t length = 0;
    // The low 8 bits are the code: the library's releases return it in types of different widths.
    const auto status = static_cast<std::uint8_t>(
        xar_signature_copy_signed_data(signature, &copy, &length, nullptr, nullptr, nullptr));
    const CopiedBytes signedData(copy);
    if (status != 0) {
        NoisyLog("Error %d prevented extracting package hash for package: %@", status, fileURL());
        return std::nullopt;
    }

    std::uint32_t algorithm = 0;
    if (const char* const size = checksumSize(archive.get()); size != nullptr) {
        NoisyLog("Package %@ uses a checksum of size %s", name(), size);
        algorithm = algorithmOfSize(size);
    }
    setDigestAlgorithm(algorithm);
    return base::toData(std::as_bytes(std::span(signedData.get(), length)));
}

std::optional<Data> PWHashedFlatPackage::_ticketData() {
    noteState();
    const auto opened = platform().files.openForReading(*fileURL());
    if (!opened) {
        NoisyLog("Could not create file handle to %@. %@", fileURL(), opened.error());
        NoisyLog("Could not get ticket for %@. %@", fileURL()->path(), opened.error());
        return std::nullopt;
    }
    trailers_ = walkPackageTrailers(**opened, name(), {}, noisyDiagnostics());
    return std::exchange(trailers_.ticket, std::nullopt);
}

std::optional<TicketPlaceFault> PWHashedFlatPackage::ticketPlaceFault() {
    ticketData();  // walks the trailers
    return explainTicketPlace(trailers_);
}

// Writing.

bool PWHashedFlatPackage::_writeNewTicketDataFromURL(const std::optional<URL>& source, const URL& target,
                                                     bool deleteExisting, ErrorOut error) {
    const std::string targetName = target.lastPathComponent();
    std::optional<Error> held;

    // Empty for a deletion. The next check refuses an empty ticket to attach, so from there on empty means a
    // deletion.
    const Data ticket = deleteExisting ? Data{} : readTicket(source, held);
    if (!deleteExisting && !isWritableTicketLength(ticket.size()))
        return refuseNewTicket(target, held, error);
    // This reads the trailers, which the code below uses.
    const bool hasTicket = ticketData().has_value();
    if (deleteExisting && !hasTicket) {
        NoisyLog("Cannot delete an existing ticket in %@ that doesn't exist.", targetName);
        return failedToWrite(held, error);
    }

    const auto opened = platform().files.openForUpdating(target);
    if (!opened) {
        held = opened.error();
        NoisyLog("Could not create file handle to %@. %@", target.path(), held);
        return failedToWrite(held, error);
    }
    std::optional<URL> copy;
    try {
        base::SparseBuffer tail = tailWith(ticket);
        // A write to a clone may be interrupted: the original still exists.
        if (target == fileURL()) copy = saveMovedTrailers(**opened, tail);
        writeTail(**opened, tail.view().subspan(kTrailerSize), targetName);
        if (copy) static_cast<void>(platform().files.removeItem(*copy));
    } catch (const base::FileFailure& failure) {
        if (copy) NoisyLog("The trailers of %@ are kept in %@.", targetName, copy->path());
        NoisyLog("Fatal error while %@ ticket to %@. %@.",
                 deleteExisting ? "deleting existing" : "writing new", target.path(), failure.what());
        return failedToWrite(held, error);
    }
    setAppropriateExitCode(kExitOK);
    return true;
}

// With space at the start for the bytes before the tail: the terminator, or a trailer's record.
base::SparseBuffer PWHashedFlatPackage::tailWith(ByteView ticket) const {
    const ByteView moved = trailers_.dataToAppend ? trailers_.dataToAppend->view() : ByteView();
    const std::size_t recordSize = ticket.empty() ? 0 : kTrailerSize;
    base::SparseBuffer tail = base::makeBuffer(kTrailerSize + moved.size() + ticket.size() + recordSize);
    tail.put(kTrailerSize, moved);
    if (ticket.empty()) return tail;
    tail.put(kTrailerSize + moved.size(), ticket);
    tail.put(kTrailerSize + moved.size() + ticket.size(),
             ticketTrailer(static_cast<std::uint32_t>(ticket.size())).bytes);
    return tail;
}

// Other makers' trailers exist nowhere else. So if some must move, all new bytes are saved until they are
// written. The copy begins with the bytes before them in the package, and its name has their offset. The copy
// is optional: the write goes on without it.
std::optional<URL> PWHashedFlatPackage::saveMovedTrailers(files::FileHandle& file,
                                                          base::SparseBuffer& tail) const {
    if (!trailers_.dataToAppend || trailers_.ticketStart < kTrailerSize) return std::nullopt;
    const std::uint64_t offset = trailers_.ticketStart - kTrailerSize;
    try {
        const Data before = file.readUpTo(offset, kTrailerSize);
        if (before.size() != kTrailerSize) return std::nullopt;
        tail.put(0, before);
    } catch (const base::ReadFailure&) {
        return std::nullopt;
    }
    files::FileManager& files = platform().files;
    const URL copy = files.temporaryDirectory().appendingPathComponent(
        values::format("%@.%llu.pkgTrailers", runtime::globallyUniqueString(), offset));
    if (!files.writeFile(tail.view(), copy, files::FileManager::Writing::plain)) return std::nullopt;
    return copy;
}

// An interrupted write must not leave a chain that has a terminator or a trailer of unknown type, but no
// ticket: the next staple would overwrite the file from its first byte on. So the terminator is written last;
// a ticket is found without it. And before new trailers overwrite the ones after the old ticket, zeros are
// written after those, so that they are no longer recognised.
void PWHashedFlatPackage::writeTail(files::FileHandle& file, ByteView tail, const std::string& targetName) {
    const bool isFirst = trailers_.ticketStart == 0 && !trailers_.hasTrailers;
    const std::uint64_t start = isFirst ? file.seekToEnd() : file.seek(trailers_.ticketStart);
    if (isFirst) trailers_.ticketStart = start + kTrailerSize;

    const std::uint64_t newEnd = trailers_.ticketStart + tail.size();
    if (trailers_.fileSize < newEnd) file.reserve(newEnd - start);
    std::uint64_t length = trailers_.fileSize;
    if (trailers_.dataToAppend) file.truncate(length += kTrailerSize);

    if (isFirst) file.seek(trailers_.ticketStart);
    file.write(tail);
    const std::uint64_t end = file.position();
    if (isFirst) {
        file.seek(start);
        file.write(kTerminatorTrailer.bytes);
    }
    if (trailers_.fileSize > end)
        NoisyLog("Truncating %@ from to %llu bytes to %llu bytes.", targetName, trailers_.fileSize, end);
    if (length > end) file.truncate(end);
    file.synchronize();
    file.close();
}

}  // namespace pinwell
