// How a flat package gets its ticket, and loses it.
#include <utility>

#include "src/PWHashedFile/PWHashedFlatPackage.h"
#include "src/PWHashedFile/package_trailer.h"
#include "src/messages.h"

namespace pinwell {

using foundation::ByteView;

bool PWHashedFlatPackage::_writeNewTicketDataFromURL(const std::optional<URL>& source, const URL& target,
                                                     bool deleteExisting, ErrorOut error) {
    const std::string targetName = target.lastPathComponent();
    std::optional<Error> held;
    const auto fail = [&] {
        setAppropriateExitCode(kExitCannotCreate);
        if (error != nullptr) *error = held;
        return false;
    };

    Data ticket;  // from here on: empty when one is deleted, and only then
    if (source && !deleteExisting) {
        auto contents = platform().files.contentsOfFile(*source);
        if (contents)
            ticket = *std::move(contents);
        else
            held = contents.error();
    }
    if (!deleteExisting && !isWritableTicketLength(ticket.size())) {
        NoisyLog("Cannot add a new ticket to %@. %@", targetName, held);
        return fail();
    }
    const bool hasTicket =
        ticketData().has_value();  // the question reads the trailers, on which all below rests
    if (deleteExisting && !hasTicket) {
        NoisyLog("Cannot delete an existing ticket in %@ that doesn't exist.", targetName);
        return fail();
    }

    const auto opened = platform().files.openForUpdating(target);
    if (!opened) {
        held = opened.error();
        NoisyLog("Could not create file handle to %@. %@", target.path(), held);
        return fail();
    }
    try {
        writeTrailers(**opened, ticket, targetName);
    } catch (const files::FileHandleError& failure) {
        NoisyLog("Fatal error while %@ ticket to %@. %@.",
                 deleteExisting ? "deleting existing" : "writing new", target.path(), failure.what());
        return fail();
    }
    setAppropriateExitCode(kExitOK);
    return true;
}

// Where the ticket goes, with room behind it for `length` bytes.
void PWHashedFlatPackage::seekToTicket(files::FileHandle& file, std::uint64_t length) {
    if (ticketStart_ != 0 || hasTrailers_) {
        file.seek(ticketStart_);
        if (origEOL_ < ticketStart_ + length) file.reserve(length);
        return;
    }
    file.seekToEnd();
    file.reserve(kTrailerSize + length);
    file.write(kTerminatorTrailer.bytes);
    ticketStart_ = file.position();
}

void PWHashedFlatPackage::writeTrailers(files::FileHandle& file, ByteView ticket,
                                        const std::string& targetName) {
    const std::uint64_t appended = dataToAppend_ ? dataToAppend_->size() : 0;
    seekToTicket(file, appended + (ticket.empty() ? 0 : ticket.size() + kTrailerSize));
    if (dataToAppend_) file.write(*dataToAppend_);
    if (!ticket.empty()) {
        file.write(ticket);
        file.write(ticketTrailer(static_cast<std::uint32_t>(ticket.size())).bytes);
    }
    const std::uint64_t end = file.position();
    if (origEOL_ > end) {
        NoisyLog("Truncating %@ from to %llu bytes to %llu bytes.", targetName, origEOL_, end);
        file.truncate(end);
    }
    file.synchronize();
    file.close();
}

}  // namespace pinwell
