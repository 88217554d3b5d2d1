// Why no ticket can be read from an artefact: the faults of the ticket's place. explain_ticket.h has the
// faults of the ticket itself.
//
// The place of a ticket is the file Contents/CodeResources of a bundle, a blob of a disk image's superblob,
// or a trailer of a flat package.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "files/file_manager.h"
#include "src/PWHashedFile/PWHashedFile.h"

namespace pinwell {

struct TicketPlaceFault {
    /// One line without a full stop.
    std::string rule;

    /// In the file that holds the ticket; `nullopt` if the file as a whole is at fault.
    std::optional<std::uint64_t> offset;

    /// The place cannot hold a ticket, so there is none. Otherwise the place is damaged, and may hold one.
    bool isAbsence = false;

    bool operator==(const TicketPlaceFault&) const = default;
};

/// The fault of the place of `file`'s ticket. `nullopt` if the place is sound, with a ticket or without.
/// Reads the ticket, and a bundle's ticket again if that fails.
std::optional<TicketPlaceFault> explainTicketPlace(PWHashedFile& file, files::FileManager& files);

}  // namespace pinwell
