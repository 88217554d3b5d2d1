// The walk along a flat package's trailers (package_trailer.h), from the end of the file to the first ticket
// or the terminator, whichever comes first. Bytes that are not a known record end it as well: without
// trailers, that is the archive itself.
//
// A walk that ends with a fault has found no ticket. The fault of a damaged record changes nothing else: the
// tool takes such a package for one without a ticket. A file shorter than a record is not a fault.
//
// There is no limit on the trailers' number or length. Time is in proportion to the bytes of the walk without
// holes, and memory to its non-zero bytes.
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

    /// There is a terminator, or a trailer of unknown type after the end of the walk.
    bool hasTrailers = false;

    /// The walk ended at the terminator.
    bool hasTerminator = false;

    /// The ticket, as much as is held (held_ticket.h), and its place in the file; both numbers are 0 if there
    /// is none.
    std::optional<foundation::Data> ticket;
    std::uint64_t ticketStart = 0;
    std::uint64_t ticketLength = 0;

    /// The unknown trailers after the ticket, in file order; `nullopt` if there are none.
    std::optional<foundation::SharedBytes> dataToAppend;

    /// The fault that ended the walk, with its offset in the file.
    std::optional<ticket_fault> fault;
};

/// Called for every record, the terminator and the ticket's too, with its place in the file.
using TrailerVisitor = std::function<void(std::uint64_t recordOffset, const trailer_header& record)>;

/// `name` is for the messages. A read error becomes a fault; throws nothing itself.
package_trailers walkPackageTrailers(files::FileReader& file, const std::string& name,
                                     const TrailerVisitor& visit = {});

}  // namespace pinwell
