// The walk along a flat package's trailers (package_trailer.h), from the end of the file to the first ticket
// or the terminator, whichever comes first. What is no record that we know ends it as well: behind an archive
// without trailers that is the archive itself.
//
// A walk that ends with a fault has found no ticket. That the file ends in less than a record is no fault.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "files/file_manager.h"
#include "files/file_reader.h"
#include "foundation/bytes.h"
#include "src/PWHashedFile/package_trailer.h"
#include "src/ticket_fault.h"

namespace pinwell {

/// Longest ticket that is read, in bytes. None comes near it, and a sparse file can claim any length.
inline constexpr std::uint64_t kMaximumTicket = files::kMaximumWholeFile;

/// Most that unknown trailers may come to together, in bytes: a million of them when they are all empty.
inline constexpr std::uint64_t kMaximumUnknownTrailers = 16ULL * 1024 * 1024;

struct package_trailers {
    std::uint64_t fileSize = 0;

    /// There is a terminator, or a trailer of unknown type behind the place where the walk ended.
    bool hasTrailers = false;

    /// The walk ended at the terminator.
    bool hasTerminator = false;

    /// The ticket, and where in the file it stands; both numbers are 0 when there is none.
    std::optional<foundation::Data> ticket;
    std::uint64_t ticketStart = 0;
    std::uint64_t ticketLength = 0;

    /// The unknown trailers behind the ticket, in file order; nothing when there are none.
    std::optional<foundation::Data> dataToAppend;

    /// What ended the walk early, and where in the file.
    std::optional<ticket_fault> fault;

    /// That was a limit of ours: there are trailers, or a ticket, that are not known and must not be written
    /// over or behind.
    bool exceedsLimits = false;
};

/// Told of every record that is met, the terminator and the ticket's included, with its place in the file.
using TrailerVisitor = std::function<void(std::uint64_t recordOffset, const trailer_header& record)>;

/// `name` is for the messages. What cannot be read is a fault; throws nothing of its own.
package_trailers walkPackageTrailers(files::FileReader& file, const std::string& name,
                                     const TrailerVisitor& visit = {});

}  // namespace pinwell
