#include "src/PWHashedFile/ticket_place.h"

#include "src/PWHashedFile/PWHashedBundle.h"
#include "src/PWHashedFile/PWHashedDiskImage.h"
#include "src/PWHashedFile/PWHashedFlatPackage.h"
#include "src/PWHashedFile/held_ticket.h"

namespace pinwell {
namespace {

std::optional<TicketPlaceFault> placeFault(const std::optional<ticket_fault>& fault) {
    if (!fault) return std::nullopt;
    return TicketPlaceFault{fault->rule, fault->offset};
}

std::optional<TicketPlaceFault> explainPlace(PWHashedBundle& bundle, files::FileManager& files) {
    if (const auto isFile = files.isRegularFile(*bundle.fileURL()); isFile && *isFile)
        return TicketPlaceFault{"an executable outside a bundle has no place for a ticket", std::nullopt,
                                true};
    const URL place = bundle.codeResourcesURL();
    const auto isRegular = files.isRegularFile(place);
    if (!isRegular) return std::nullopt;  // nothing is there
    if (!*isRegular)
        return TicketPlaceFault{"Contents/CodeResources is not a regular file", std::nullopt, true};
    if (bundle.ticketData()) return std::nullopt;
    const auto bytes = files.contentsOfFile(place);
    if (bytes) return std::nullopt;  // an empty file
    const std::string& reason = bytes.error().localizedFailureReason();
    return TicketPlaceFault{
        "the ticket file cannot be read: " + (reason.empty() ? bytes.error().localizedDescription() : reason),
        std::nullopt};
}

std::optional<TicketPlaceFault> explainPlace(const PWHashedDiskImage& image) {
    if (image.fault()) return placeFault(image.fault());
    const BlobRecord* const blob = ticketBlobOf(image.blobs());
    if (blob == nullptr) return std::nullopt;
    const std::uint64_t length = ticketIn(*blob).size();
    return placeFault(faultOfTicketLength(length, image.csStart() + blob->offset + blob->length() - length));
}

std::optional<TicketPlaceFault> explainPlace(PWHashedFlatPackage& package) {
    package.ticketData();  // walks the trailers
    if (package.fault()) return placeFault(package.fault());
    return placeFault(faultOfTicketLength(package.ticketLength(), package.ticketStart()));
}

}  // namespace

std::optional<TicketPlaceFault> explainTicketPlace(PWHashedFile& file, files::FileManager& files) {
    if (const auto* const image = dynamic_cast<const PWHashedDiskImage*>(&file)) return explainPlace(*image);
    if (auto* const package = dynamic_cast<PWHashedFlatPackage*>(&file)) return explainPlace(*package);
    if (auto* const bundle = dynamic_cast<PWHashedBundle*>(&file)) return explainPlace(*bundle, files);
    return std::nullopt;
}

}  // namespace pinwell
