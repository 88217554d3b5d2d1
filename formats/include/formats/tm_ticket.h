// The ticket: the payload of a satchel, which lists the code-directory hashes that it vouches for.
//
// Payload. All integers are little-endian.
//
//   Offset  Size           Field
//   0       4              magic, "m8tk"
//   4       2              version, 1 or 2
//   6       2              hash length, 20 or 48
//   8       4              number of entries
//   12      4              flags: bit 0 means revoked, the others have no meaning
//   16      8              signature time; kept, never interpreted (in our own tickets, the
//                          seconds since 1970-01-01 00:00:00 UTC)
//   24      n x entrySize  entries
//
// An entry of version 1 is a hash; an entry of version 2 is an algorithm byte, then a hash. The payload has
// exactly the length that its count gives, from 24 bytes to 16 MiB.
//
// Refused when decoded: any other magic, version, hash length or size. Refused only on copying: a version 2
// entry whose algorithm is 0 or unknown, or whose algorithm's hash is longer than the ticket's hash length.
// The other entries of such a ticket stay usable. If the algorithm's hash is shorter, the first bytes of the
// entry count.
//
// A ticket is immutable and independent of the bytes it was decoded from; it may be read from any thread. The
// functions return 0 for success and -1 for any refusal, except where they say otherwise.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>
#include <vector>

#include "base/bytes.h"
#include "formats/findings.h"
#include "trust/trust.h"

namespace pinwell {

inline constexpr std::string_view kTicketMagic = "m8tk";
inline constexpr std::size_t kTicketHeaderSize = 24;
inline constexpr std::size_t kTicketMaximumSize = 16 * 1024 * 1024;

/// Flag: the software must not run.
inline constexpr std::uint32_t kTicketRevoked = 1;

/// One heap block behind an opaque pointer. The owner frees it, once, with tm_ticket_free.
struct tm_ticket;

/// One hash of a ticket.
struct tm_cdhash {
    std::uint32_t algorithm = 0;          // 0 in version 1 tickets, which name none
    std::uint16_t length = 0;             // 20 or 48
    std::array<std::byte, 64> hash = {};  // zero after the first `length` bytes
};

/// From a container to its ticket, or a refusal: satchel_get_validated_payload, then tm_ticket_decode.
/// `ticket` is written only on success.
std::int32_t satchel_get_validated_tm_ticket(const std::byte* container, std::uint64_t length,
                                             tm_ticket** ticket, trust::TrustService& service);

/// Decodes a payload that has been verified. `ticket` is written only on success.
std::int32_t tm_ticket_decode(const std::byte* payload, std::int64_t size, tm_ticket** ticket);

/// The fields of a payload's header, as stored. The object has them too, in another order.
struct TicketFields {
    std::uint16_t version = 0;
    std::uint16_t hashLength = 0;
    std::uint32_t count = 0;
    std::uint32_t flags = 0;
    std::uint64_t signatureTime = 0;
};

/// The fields of a payload, valid or damaged, to show a damaged one. The fields are as stored; `nullopt` if
/// the payload is shorter than its header.
struct TicketSurvey {
    std::optional<TicketFields> header;  // `nullopt` if it is shorter

    /// How the entries are read: as the header says. If the header contradicts the payload's size, with the
    /// version and hash length that agree with most of the header.
    std::uint16_t version = 0;
    std::uint16_t hashLength = 0;
    std::uint64_t count = 0;
    base::ByteView entries;  // part of the payload

    /// `nullopt` if tm_ticket_decode accepts the payload.
    std::optional<TicketFault> fault;

    std::uint64_t entrySize() const;
};
TicketSurvey surveyTicketPayload(base::ByteView payload);

/// The entry at `index` of a survey, by the rules of tm_ticket_copy_cdhash.
std::int32_t readSurveyedHash(const TicketSurvey& survey, std::uint64_t index, tm_cdhash* cdhash);

/// A ticket of the same bytes; null if memory runs out.
tm_ticket* tm_ticket_copy(const tm_ticket* ticket);

/// Null is harmless.
void tm_ticket_free(tm_ticket* ticket) noexcept;

// These take a ticket and do not check for null.
std::uint16_t tm_ticket_get_version(const tm_ticket* ticket);
std::uint64_t tm_ticket_get_signature_time(const tm_ticket* ticket);
std::uint32_t tm_ticket_get_flags(const tm_ticket* ticket);
std::uint32_t tm_ticket_get_cdhash_count(const tm_ticket* ticket);

/// The entry at `index`. `cdhash` is written only on success.
std::int32_t tm_ticket_copy_cdhash(const tm_ticket* ticket, std::uint64_t index, tm_cdhash* cdhash);

/// Whether one of the entries is this hash. Compares as many bytes as the entry's algorithm has, and not the
/// algorithm's number. Skips entries that cannot be copied.
bool ticketListsHash(const tm_ticket* ticket, base::ByteView cdhash);

/// The hashes of its entries, in their order. Skips entries that cannot be copied.
std::vector<base::Data> hashesInTicket(const tm_ticket* ticket);

/// Whether it marks the software as revoked.
bool ticketRevokes(const tm_ticket* ticket);

/// Bytes of a code-directory hash by its algorithm, numbered as in code directories (codesign::DigestType):
/// 20 for 0 to 3, 48 for 4; 0 if unknown.
std::size_t tm_cdhash_algorithm_get_size(std::uint32_t algorithm);

/// A ticket with an owner.
struct TicketDeleter {
    void operator()(tm_ticket* ticket) const noexcept { tm_ticket_free(ticket); }
};
using TicketPointer = std::unique_ptr<tm_ticket, TicketDeleter>;

/// satchel_get_validated_tm_ticket, with an owner; null for a refusal.
TicketPointer genuineTicket(base::ByteView container, trust::TrustService& service);

// How much of a stapled ticket is held in memory.

/// A stale ticket may have any length and content, and can be replaced. A ticket longer than the sum of its
/// parts' maxima is never accepted. So only its beginning is held, which is refused like the whole.
inline constexpr std::uint64_t kLongestTicketHeld = 64ULL * 1024 * 1024;

/// How many bytes of a ticket of that length are held.
std::uint64_t heldOfTicket(std::uint64_t length);

/// The fault of a ticket of that length that begins at `offset` in its file; `nullopt` if it is held whole.
std::optional<TicketFault> faultOfTicketLength(std::uint64_t length, std::uint64_t offset);

}  // namespace pinwell
