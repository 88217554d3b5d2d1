#include "ticket/removable_package.h"

#include "src/PWHashedFile/package_trailer.h"
#include "src/messages.h"

namespace pinwell::ticket_files {

bool RemovablePackage::_writeNewTicketDataFromURL(const std::optional<URL>& source, const URL& target,
                                                  bool deleteExisting, ErrorOut error) {
    if (deleteExisting && ticketData()) {
        try {
            const auto opened = platform().files.openForUpdating(target);
            if (opened && cutTerminatorToo(**opened)) {
                setAppropriateExitCode(kExitOK);
                return true;
            }
        } catch (const files::FileHandleError& failure) {
            NoisyLog("Fatal error while deleting existing ticket to %@. %@.", target.path(), failure.what());
            return failedToWrite(std::nullopt, error);
        }
    }
    return PWHashedFlatPackage::_writeNewTicketDataFromURL(source, target, deleteExisting, error);
}

// False, and nothing is written, unless terminator and ticket are all that there is behind the archive. One
// cut: whenever the process dies, the ticket is there or both are gone.
bool RemovablePackage::cutTerminatorToo(files::FileHandle& file) const {
    if (dataToAppend() || ticketStart() < kTrailerSize) return false;
    const std::uint64_t terminator = ticketStart() - kTrailerSize;
    file.seek(terminator);
    trailer_header record;
    if (!trailer_data_is_valid(file.read(kTrailerSize), &record) ||
        !trailer_is_terminator(record.firstWord(), record.length()))
        return false;
    file.truncate(terminator);
    file.synchronize();
    file.close();
    return true;
}

}  // namespace pinwell::ticket_files
