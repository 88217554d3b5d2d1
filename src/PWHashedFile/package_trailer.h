// The trailer records behind a flat package's archive.
//
// | Offset | Size | Field                                                                       |
// |--------|------|-----------------------------------------------------------------------------|
// | 0      | 4    | magic, "t8lr"                                                               |
// | 4      | 2    | version, 1                                                                  |
// | 6      | 2    | type: 1 terminator, 2 ticket, others unknown                                |
// | 8      | 4    | length of the data, which stand immediately before the record               |
// | 12     | 4    | upper half of the length: written as zero, never looked at                  |
//
// Little-endian. The record comes behind its data, so that the chain can be walked from the end of the file,
// as far as the terminator, which has no data and stands right behind the archive:
//
//   archive | terminator | unknown trailers ... | ticket, its record | unknown trailers ...
#pragma once

#include <array>
#include <cstdint>
#include <string>

#include "foundation/bytes.h"

namespace pinwell {

inline constexpr std::size_t kTrailerSize = 16;
inline constexpr std::uint16_t kTrailerVersion = 1;
inline constexpr std::uint16_t kTerminatorTrailerType = 1;
inline constexpr std::uint16_t kTicketTrailerType = 2;

/// One record, as stored.
struct trailer_header {
    std::array<std::byte, kTrailerSize> bytes{};

    /// The four characters, whatever they are.
    std::string magic() const;
    std::uint16_t version() const;
    std::uint16_t type() const;

    /// The low 32 bits, which are all that counts.
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

/// Whether a ticket of that many bytes can be written: not an empty one, nor one whose length has no room in
/// its record.
bool isWritableTicketLength(std::uint64_t length);

/// Whether the bytes are a record of the version and magic that we know; says why not. `record`, when given,
/// gets the bytes of one that is.
bool trailer_data_is_valid(foundation::ByteView bytes, trailer_header* record);

/// Whether a valid record with these first 8 bytes and this length is the terminator; says why not. Only the
/// low 32 bits of the length are tested.
bool trailer_is_terminator(std::uint64_t firstWord, std::uint64_t length);

}  // namespace pinwell
