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

// A write that is cut short must not leave a chain that ends in a terminator, or in a trailer of unknown
// type, with no ticket in it: the next staple would write over the file from its first byte on. So the
// terminator, without which a ticket is found just as well, comes last; and trailers that stood behind the
// old ticket are made unrecognisable, by zeros behind them, before the new ones are written over them.
void PWHashedFlatPackage::writeTrailers(files::FileHandle& file, ByteView ticket,
                                        const std::string& targetName) {
    const bool isFirst = ticketStart_ == 0 && !hasTrailers_;
    const std::uint64_t start = isFirst ? file.seekToEnd() : file.seek(ticketStart_);
    if (isFirst) ticketStart_ = start + kTrailerSize;

    const std::uint64_t appended = dataToAppend_ ? dataToAppend_->size() : 0;
    const std::uint64_t written = appended + (ticket.empty() ? 0 : ticket.size() + kTrailerSize);
    if (origEOL_ < ticketStart_ + written) file.reserve(ticketStart_ + written - start);
    std::uint64_t length = origEOL_;
    if (dataToAppend_) file.truncate(length += kTrailerSize);

    if (isFirst) file.seek(ticketStart_);
    if (dataToAppend_) file.write(*dataToAppend_);
    if (!ticket.empty()) {
        file.write(ticket);
        file.write(ticketTrailer(static_cast<std::uint32_t>(ticket.size())).bytes);
    }
    const std::uint64_t end = file.position();
    if (isFirst) {
        file.seek(start);
        file.write(kTerminatorTrailer.bytes);
    }
    if (origEOL_ > end)
        NoisyLog("Truncating %@ from to %llu bytes to %llu bytes.", targetName, origEOL_, end);
    if (length > end) file.truncate(end);
    file.synchronize();
    file.close();
}

}  // namespace pinwell
