#include "src/PWHashedFile/PWHashedBundle.h"

#include "runtime/process.h"
#include "runtime/signals.h"
#include "src/cdhash_extract.h"
#include "src/messages.h"
#include "values/value.h"

namespace pinwell {

URL PWHashedBundle::codeResourcesURL() const {
    return fileURL()->appendingPathComponent("Contents").appendingPathComponent("CodeResources");
}

std::optional<Data> PWHashedBundle::_ticketData() {
    const URL ticket = codeResourcesURL();
    const auto isRegular = platform().files.isRegularFile(ticket);
    if (!isRegular || !*isRegular) return std::nullopt;
    return platform().files.contentsOfFile(ticket).asOptional();
}

std::optional<TicketPlaceFault> PWHashedBundle::ticketPlaceFault() {
    files::FileManager& files = platform().files;
    if (const auto isFile = files.isRegularFile(*fileURL()); isFile && *isFile)
        return TicketPlaceFault{"an executable outside a bundle has no place for a ticket", std::nullopt,
                                true};
    const URL place = codeResourcesURL();
    const auto isRegular = files.isRegularFile(place);
    if (!isRegular) return std::nullopt;  // nothing is there
    if (!*isRegular)
        return TicketPlaceFault{"Contents/CodeResources is not a regular file", std::nullopt, true};
    if (ticketData()) return std::nullopt;
    const auto bytes = files.contentsOfFile(place);
    if (bytes) return std::nullopt;  // an empty file
    const std::string& reason = bytes.error().localizedFailureReason();
    return TicketPlaceFault{
        "the ticket file cannot be read: " + (reason.empty() ? bytes.error().localizedDescription() : reason),
        std::nullopt};
}

std::optional<Data> PWHashedBundle::_cdHash() {
    const values::Value properties = basicCodeProperties(*fileURL(), platform());
    const auto algorithm = properties[kDigestAlgorithmKey].unsignedIntegerValue();
    setDigestAlgorithm(static_cast<std::uint32_t>(algorithm));
    NoisyLog("Props are %@", properties);
    const Data* hash = properties[kCDHashKey].data();
    return hash == nullptr ? std::nullopt : std::optional(*hash);
}

bool PWHashedBundle::writeNewTicketDataFromURL(const URL& source, ErrorOut error) {
    const runtime::SignalDeferral uninterrupted;
    files::FileManager& files = platform().files;
    const URL ticket = codeResourcesURL();

    if (const auto isRegular = files.isRegularFile(ticket); isRegular && !*isRegular) {
        NoisyLog("%@ will not replace the compatibility symlink at %@. Please remove it manually",
                 runtime::processName(), ticket);
        return failedToWrite(std::nullopt, error);
    }
    // Only the bytes: the source is a private temporary file, but everyone with the bundle reads the ticket.
    if (!files.copyContents(source, ticket)) {
        if (const auto removed = files.removeItem(ticket); !removed) {
            NoisyLog("Could not remove existing ticket from %@ because an error occurred. %@", ticket,
                     removed.error());
            return failedToWrite(removed.error(), error);
        }
        if (const auto copied = files.copyContents(source, ticket); !copied) {
            NoisyLog("Could not save ticket to %@ because an error occurred. %@", ticket, copied.error());
            return failedToWrite(copied.error(), error);
        }
    }
    setAppropriateExitCode(kExitOK);
    return true;
}

bool PWHashedBundle::_deleteExistingTicket() {
    const auto trashed = platform().files.trashItem(codeResourcesURL());
    if (!trashed) {
        NoisyLog("Could not delete ticket %@. %@", codeResourcesURL(), trashed.error());
        return false;
    }
    NoisyLog("Successfully moved ticket to trash. Find it at %@", *trashed);
    return true;
}

}  // namespace pinwell
