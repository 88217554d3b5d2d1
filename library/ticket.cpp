// Takes tickets apart with the surveys of the tool, and finds them in disk images and flat packages by the
// steps of the tool.
#include "pinwell/ticket.h"

#include <utility>

#include "base/byte_source.h"
#include "base/bytes.h"
#include "base/error.h"
#include "formats/disk_image.h"
#include "formats/package_trailers.h"
#include "formats/satchel.h"
#include "formats/tm_ticket.h"

namespace pinwell::ticket {
inline namespace v1 {

static_assert(kFlagRevoked == kTicketRevoked);
static_assert(TrailerType{kTerminatorTrailerType} == TrailerType::terminator);
static_assert(TrailerType{kTicketTrailerType} == TrailerType::ticket);

namespace {

using base::ByteSource;
using base::FileSource;

/// The parsers' diagnostics, which name the file, are for the tool's verbose mode.
constexpr const char* kNoName = "";

Error malformed(const TicketFault& fault, std::uint64_t base = 0) {
    return {ErrorCode::malformed, base + fault.offset, 0, fault.rule};
}

Error unreadable(const base::Error& error) {
    const bool isErrno = error.domain() == base::kPOSIXErrorDomain;
    return {ErrorCode::unreadable, 0, isErrno ? static_cast<int>(error.code()) : 0,
            error.localizedFailureReason()};
}

/// The offset of `part` in `whole`, which contains it.
std::uint64_t offsetIn(ByteView whole, const std::byte* part) {
    return static_cast<std::uint64_t>(part - whole.data());
}

Slot slotOf(const BlobRecord& blob, std::uint64_t superblobOffset) {
    return {blob.slotType,
            std::string(slotName(blob.slotType)),
            blob.magic,
            {superblobOffset + blob.offset, blob.length()}};
}

Result<DiskImage> diskImageIn(const ByteSource& file) {
    DiskImageSignature read;
    const bool isImage = readDiskImageTrailer(file, kNoName, read) &&
                         (!read.isSigned() ||
                          (readDiskImageSuperblob(file, kNoName, read) && readDiskImageBlobs(kNoName, read)));
    if (!isImage) return malformed(*read.fault);

    DiskImage image;
    image.fileSize = read.fileSize;
    image.trailer = {read.fileSize - kUDIFHeaderSize, kUDIFHeaderSize};
    if (!read.isSigned()) return image;
    image.superblob = Range{read.csStart, read.csLength};
    for (const BlobRecord& blob : read.blobs) image.slots.push_back(slotOf(blob, read.csStart));
    if (const BlobRecord* const blob = ticketBlobOf(read.blobs)) {
        const ByteView bytes = ticketIn(*blob);
        const Range whole = slotOf(*blob, read.csStart).range;
        const std::uint64_t offset = whole.offset + whole.length - bytes.size();
        // A ticket is returned whole or not at all.
        if (const auto fault = faultOfTicketLength(bytes.size(), offset)) return malformed(*fault);
        image.ticket = FoundTicket{{offset, bytes.size()}, base::toData(bytes)};
    }
    return image;
}

Result<FlatPackage> flatPackageIn(const ByteSource& file) {
    FlatPackage package;
    PackageTrailers read = walkPackageTrailers(file, kNoName, [&](const SurveyedTrailer& trailer) {
        // Without data the walk ends with a fault, and this value is not returned.
        if (trailer.dataOffset)
            package.trailers.push_back({TrailerType{trailer.record.type()},
                                        trailer.recordOffset,
                                        {*trailer.dataOffset, trailer.record.length()}});
    });
    if (read.fault) return malformed(*read.fault);
    package.fileSize = read.fileSize;
    package.hasTerminator = read.hasTerminator;
    if (const auto fault = faultOfTicketLength(read.ticketLength, read.ticketStart)) return malformed(*fault);
    if (read.ticket)
        package.ticket = FoundTicket{{read.ticketStart, read.ticketLength}, *std::move(read.ticket)};
    return package;
}

template <class Read>
auto readIn(const base::Result<FileSource>& file, Read read) -> decltype(read(*file)) {
    if (!file) return unreadable(file.error());
    return read(*file);
}

}  // namespace

std::uint32_t version() noexcept {
    return PINWELL_TICKET_VERSION;
}

Result<Container> decodeContainer(ByteView ticket) {
    const SatchelSurvey frame = surveySatchelContainer(ticket);
    if (frame.fault) return malformed(*frame.fault);

    const ByteView block(frame.view.certificates, frame.view.certificatesLength);
    const SatchelCertificateBlock certificates = surveySatchelCertificates(block);
    if (certificates.fault) return malformed(*certificates.fault, offsetIn(ticket, block.data()));

    Container container;
    container.version = frame.header->version;
    container.reserved = frame.header->reserved;
    container.signedBytes = ByteView(frame.view.signedData, frame.view.signedDataLength);
    const auto found = std::span(certificates.elements).first(certificates.count);
    container.certificates.assign(found.begin(), found.end());
    container.payload = ByteView(frame.view.payload, frame.view.payloadLength);
    container.signature = ByteView(frame.view.signature, frame.view.signatureLength);
    return container;
}

Result<Payload> decodePayload(ByteView payload) {
    const TicketSurvey survey = surveyTicketPayload(payload);
    if (survey.fault) return malformed(*survey.fault);
    return Payload{survey.header->version, survey.header->hashLength,    survey.header->count,
                   survey.header->flags,   survey.header->signatureTime, payload};
}

std::optional<Entry> entryAt(const Payload& payload, std::uint64_t index) {
    const TicketSurvey survey = surveyTicketPayload(payload.bytes);
    tm_cdhash cdhash;
    if (survey.fault || readSurveyedHash(survey, index, &cdhash) != 0) return std::nullopt;
    return Entry{cdhash.algorithm, base::toData(ByteView(cdhash.hash).first(cdhash.length))};
}

Result<DiskImage> readDiskImage(const std::string& path) {
    return readIn(FileSource::open(base::Places(), path), diskImageIn);
}

Result<DiskImage> readDiskImage(int descriptor) {
    return readIn(FileSource::borrow(descriptor), diskImageIn);
}

Result<FlatPackage> readFlatPackage(const std::string& path) {
    return readIn(FileSource::open(base::Places(), path), flatPackageIn);
}

Result<FlatPackage> readFlatPackage(int descriptor) {
    return readIn(FileSource::borrow(descriptor), flatPackageIn);
}

}  // namespace v1
}  // namespace pinwell::ticket
