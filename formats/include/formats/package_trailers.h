// The trailers after a flat package's archive: their records, and two walks along their chain.
//
// | Offset | Size | Field                                                                       |
// |--------|------|-----------------------------------------------------------------------------|
// | 0      | 4    | magic, "t8lr"                                                               |
// | 4      | 2    | version, 1                                                                  |
// | 6      | 2    | type: 1 terminator, 2 ticket, others unknown                                |
// | 8      | 4    | length of the data, directly before the record                              |
// | 12     | 4    | upper half of the length: written as zero, never read                       |
//
// Little-endian. The record follows its data, so that the chain can be read from the end of the file to the
// terminator, which has no data and directly follows the archive:
//
//   archive | terminator | unknown trailers ... | ticket, its record | unknown trailers ...
//
// There is no limit on the trailers' number or length. The time of a walk is in proportion to its bytes
// without holes, its memory to the non-zero bytes.
#pragma once

#include <array>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "base/byte_source.h"
#include "base/bytes.h"
#include "formats/findings.h"

namespace pinwell {

inline constexpr std::size_t kTrailerSize = 16;
inline constexpr std::uint16_t kTrailerVersion = 1;
inline constexpr std::uint16_t kTerminatorTrailerType = 1;
inline constexpr std::uint16_t kTicketTrailerType = 2;

/// One record, as stored.
struct trailer_header {
    std::array<std::byte, kTrailerSize> bytes{};

    /// The four characters, valid or not.
    std::string magic() const;
    std::uint16_t version() const;
    std::uint16_t type() const;

    /// The low 32 bits; only these count.
    std::uint32_t length() const;

    /// The first 8 bytes as one integer.
    std::uint64_t firstWord() const;
};

/// Version 1, type 1, length 0.
inline constexpr trailer_header kTerminatorTrailer{{std::byte{'t'}, std::byte{'8'}, std::byte{'l'},
                                                    std::byte{'r'}, std::byte{kTrailerVersion}, std::byte{0},
                                                    std::byte{kTerminatorTrailerType}}};

/// The record of a ticket of that length.
trailer_header ticketTrailer(std::uint32_t length);

/// Whether a ticket of that many bytes can be written: it is not empty, and its length fits the
/// record.
bool isWritableTicketLength(std::uint64_t length);

/// Whether the bytes are a record with a known version and magic. A diagnostic line gives the reason if not.
/// A non-null `record` gets the bytes of a valid record.
bool trailer_data_is_valid(base::ByteView bytes, trailer_header* record, const Diagnostics& diagnostics = {});

/// Whether a valid record with these first 8 bytes and this length is the terminator. A diagnostic line gives
/// the reason if not. Only the low 32 bits of the length are tested.
bool trailer_is_terminator(std::uint64_t firstWord, std::uint64_t length,
                           const Diagnostics& diagnostics = {});

/// The fault of a damaged record at `recordOffset`; `nullopt` for a sound record. `nullopt` as well for bytes
/// that do not look like a record: a record has the magic, or a known version and type.
std::optional<TicketFault> faultOfTrailer(const trailer_header& record, std::uint64_t recordOffset);

/// One trailer of a chain, with its place in the file.
struct SurveyedTrailer {
    std::uint64_t recordOffset = 0;
    trailer_header record;
    bool isTerminator = false;

    /// The start of its record.length() bytes of data; `nullopt` if it would be before the file.
    std::optional<std::uint64_t> dataOffset;

    /// If the record is damaged.
    std::optional<TicketFault> fault;
};
using TrailerVisitor = std::function<void(const SurveyedTrailer& trailer)>;

/// The results of a walk that passes tickets and damaged records, to show them.
struct PackageTrailerSurvey {
    bool hasTerminator = false;

    /// The place of the first ticket from the end of the file, the only one that counts; `nullopt` if there
    /// is none.
    std::optional<std::uint64_t> ticketStart;
    std::uint64_t ticketLength = 0;

    /// The first fault after this ticket, or that the ticket is too long to be read. So it is the fault of
    /// walkPackageTrailers().
    std::optional<TicketFault> fault;
};

/// Walks from the end of the file to the terminator, or to bytes that do not look like a record. `visit` gets
/// each trailer on the way. Throws base::ReadFailure.
PackageTrailerSurvey surveyPackageTrailers(const base::ByteSource& file, const TrailerVisitor& visit);

struct PackageTrailers {
    std::uint64_t fileSize = 0;

    /// There is a terminator, or a trailer of unknown type after the end of the walk.
    bool hasTrailers = false;

    /// The walk ended at the terminator.
    bool hasTerminator = false;

    /// The ticket, as much as is held (tm_ticket.h), and its place in the file; both numbers are 0 if there
    /// is none.
    std::optional<base::Data> ticket;
    std::uint64_t ticketStart = 0;
    std::uint64_t ticketLength = 0;

    /// The unknown trailers after the ticket, in file order; `nullopt` if there are none.
    std::optional<base::SharedBytes> dataToAppend;

    /// The fault that ended the walk, with its offset in the file.
    std::optional<TicketFault> fault;
};

/// The tool's walk: from the end of the file to the first ticket or the terminator, whichever comes first.
/// Bytes that are not a valid record end it as well: without trailers, that is the archive itself.
///
/// A walk that ends with a fault has found no ticket. The fault of a damaged record changes nothing else: the
/// tool takes such a package for one without a ticket. A file shorter than a record is not a fault.
///
/// `name` is for the diagnostics. `visit`, if given, gets every valid record, the terminator's and the
/// ticket's too. A read error becomes a fault; throws nothing itself.
PackageTrailers walkPackageTrailers(const base::ByteSource& file, const std::string& name,
                                    const TrailerVisitor& visit = {}, const Diagnostics& diagnostics = {});

}  // namespace pinwell
