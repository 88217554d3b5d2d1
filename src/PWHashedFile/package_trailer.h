// The trailer records after a flat package's archive.
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
#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <string>

#include "foundation/bytes.h"
#include "src/ticket_fault.h"

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

/// Whether the bytes are a record with a known version and magic; prints the reason if not. A non-null
/// `record` gets the bytes of a valid record.
bool trailer_data_is_valid(foundation::ByteView bytes, trailer_header* record);

/// The fault of a damaged record at `recordOffset`; `nullopt` for a sound record. `nullopt` as well for bytes
/// that do not look like a record: a record has the magic, or a known version and type.
std::optional<ticket_fault> faultOfTrailer(const trailer_header& record, std::uint64_t recordOffset);

/// Whether a valid record with these first 8 bytes and this length is the terminator; prints the reason if
/// not. Only the low 32 bits of the length are tested.
bool trailer_is_terminator(std::uint64_t firstWord, std::uint64_t length);

}  // namespace pinwell
