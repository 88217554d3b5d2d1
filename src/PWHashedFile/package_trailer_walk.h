// The walk along a flat package's trailers (package_trailer.h), from the end of the file to the first ticket
// or the terminator, whichever comes first. What is no record that we know ends it as well: behind an archive
// without trailers that is the archive itself.
//
// A walk that ends with a fault has found no ticket. That the file ends in less than a record is no fault.
//
// There is no limit on the trailers' number or length: time goes with the bytes from the file's end to where
// the walk ends, holes aside, and memory with those that are no zeros.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "files/file_reader.h"
#include "foundation/bytes.h"
#include "src/PWHashedFile/package_trailer.h"
#include "src/ticket_fault.h"

namespace pinwell {

struct package_trailers {
    std::uint64_t fileSize = 0;

    /// There is a terminator, or a trailer of unknown type behind the place where the walk ended.
    bool hasTrailers = false;

    /// The walk ended at the terminator.
    bool hasTerminator = false;

    /// The ticket, as far as it is held (held_ticket.h), and its place in the file; both numbers are 0 when
    /// there is none.
    std::optional<foundation::Data> ticket;
    std::uint64_t ticketStart = 0;
    std::uint64_t ticketLength = 0;

    /// The unknown trailers behind the ticket, in file order; nothing when there are none.
    std::optional<foundation::SharedBytes> dataToAppend;

    /// What ended the walk early, and where in the file.
    std::optional<ticket_fault> fault;
};

/// Told of every record that is met, the terminator and the ticket's included, with its place in the file.
using TrailerVisitor = std::function<void(std::uint64_t recordOffset, const trailer_header& record)>;

/// `name` is for the messages. What cannot be read is a fault; throws nothing of its own.
package_trailers walkPackageTrailers(files::FileReader& file, const std::string& name,
                                     const TrailerVisitor& visit = {});

}  // namespace pinwell
