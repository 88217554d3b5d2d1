// The ticket object is one block of bytes, as long as its payload. Integers stay
// little-endian.
//
//   Offset  Size           Field
//   0       2              version
//   2       2              hash length
//   4       4              number of entries
//   8       8              signature time
//   16      4              flags
//   20      n x entrySize  entries, as in the payload
//   end-4   4              zero
//
// A struct followed by the entries would need a flexible array member, which C++ does not have, or pointer
// arithmetic beyond an object, which is undefined. So the block is an array of single bytes of the type
// tm_ticket, and a ticket is the address of its first element. The fields are read through the same
// bounds-checked cursor as input.
#include "formats/tm_ticket.h"

#include <algorithm>
#include <initializer_list>
#include <limits>
#include <new>
#include <span>
#include <utility>

#include "base/byte_io.h"
#include "base/bytes.h"
#include "formats/satchel.h"

namespace pinwell {

struct tm_ticket {
    std::byte value;
};
static_assert(sizeof(tm_ticket) == 1);

namespace {

using base::asBytes;
using base::ByteReader;
using base::ByteView;

constexpr std::uint16_t kVersionWithoutAlgorithms = 1;
constexpr std::uint16_t kVersionWithAlgorithms = 2;

// By algorithm number; also the hash lengths that a ticket may have.
constexpr std::array<std::uint16_t, 5> kHashSizes = {20, 20, 20, 20, 48};
constexpr std::uint32_t kUnnamedAlgorithm = 0;

constexpr std::size_t kBlockHeaderSize = 20;

std::uint64_t sizeOfEntry(std::uint16_t version, std::uint16_t hashLength) {
    return hashLength + (version == kVersionWithAlgorithms ? 1U : 0U);
}
std::uint64_t sizeOfEntry(const TicketFields& fields) {
    return sizeOfEntry(fields.version, fields.hashLength);
}
std::uint64_t sizeOfPayload(const TicketFields& fields) {
    return kTicketHeaderSize + fields.count * sizeOfEntry(fields);
}
// A count has 32 bits, so a ticket's size and the offset of an entry in it always fit 64
// bits.
static_assert(std::uint64_t{kHashSizes.back()} + 1 <
              std::numeric_limits<std::uint64_t>::max() / std::numeric_limits<std::uint32_t>::max());

TicketFields readPayloadHeader(ByteReader& reader) {
    TicketFields header;
    header.version = reader.le16("ticket version");
    header.hashLength = reader.le16("ticket hash length");
    header.count = reader.le32("number of ticket entries");
    header.flags = reader.le32("ticket flags");
    header.signatureTime = reader.le64("ticket signature time");
    return header;
}

TicketFields readBlockHeader(ByteReader& reader) {
    TicketFields header;
    header.version = reader.le16("version");
    header.hashLength = reader.le16("hash length");
    header.count = reader.le32("number of entries");
    header.signatureTime = reader.le64("signature time");
    header.flags = reader.le32("flags");
    return header;
}

// The first `size` bytes of a ticket's block.
ByteView blockBytes(const tm_ticket* ticket, std::uint64_t size) {
    return std::as_bytes(std::span(ticket, static_cast<std::size_t>(size)));
}

TicketFields blockHeader(const tm_ticket* ticket) {
    ByteReader reader(blockBytes(ticket, kBlockHeaderSize));
    return readBlockHeader(reader);
}

std::optional<TicketFault> findFault(ByteView payload, const TicketFields& header, bool magic) {
    if (payload.size() > kTicketMaximumSize) return TicketFault{0, "the payload is longer than 16 MiB"};
    if (!magic) return TicketFault{0, "the payload does not begin with its magic, \"m8tk\""};
    if (header.version != kVersionWithoutAlgorithms && header.version != kVersionWithAlgorithms)
        return TicketFault{4, "the payload's version is neither 1 nor 2"};
    if (std::ranges::find(kHashSizes, header.hashLength) == kHashSizes.end())
        return TicketFault{6, "the hash length is neither 20 nor 48"};
    if (sizeOfPayload(header) != payload.size())
        return TicketFault{8, "the number of entries does not fit the payload's length"};
    return std::nullopt;
}

// The version and hash length that agree with most of the stored fields; the stored ones if all agree.
TicketFields likeliestLayout(const TicketFields& stored, std::uint64_t entriesSize) {
    TicketFields best = stored;
    int most = -1;
    for (const std::uint16_t version : {kVersionWithAlgorithms, kVersionWithoutAlgorithms}) {
        for (const std::uint16_t hashLength : {kHashSizes.front(), kHashSizes.back()}) {
            TicketFields layout = stored;
            layout.version = version;
            layout.hashLength = hashLength;
            const bool fits = layout.count * sizeOfEntry(layout) == entriesSize;
            const int agreed = (version == stored.version ? 1 : 0) +
                               (hashLength == stored.hashLength ? 1 : 0) + (fits ? 1 : 0);
            if (agreed <= most) continue;
            best = layout;
            most = agreed;
        }
    }
    return best;
}

std::int32_t copyEntry(ByteReader entry, std::uint16_t version, std::uint16_t hashLength, tm_cdhash* cdhash) {
    tm_cdhash record;
    record.algorithm = kUnnamedAlgorithm;
    if (version == kVersionWithAlgorithms) {
        record.algorithm = entry.u8("algorithm");
        if (record.algorithm == kUnnamedAlgorithm) return kRefused;
    }
    const std::size_t length = tm_cdhash_algorithm_get_size(record.algorithm);
    if (length == 0 || length > hashLength) return kRefused;
    std::ranges::copy(entry.bytes(length, "hash"), record.hash.begin());
    record.length = static_cast<std::uint16_t>(length);
    *cdhash = record;
    return kAccepted;
}

// A zeroed block that begins with the parts, one after the other; null if memory runs out.
TicketPointer makeBlock(std::uint64_t size, std::initializer_list<ByteView> parts) {
    TicketPointer ticket(new (std::nothrow) tm_ticket[static_cast<std::size_t>(size)]{});
    if (ticket == nullptr) return nullptr;
    auto end = std::as_writable_bytes(std::span(ticket.get(), static_cast<std::size_t>(size))).begin();
    for (const ByteView part : parts) end = std::ranges::copy(part, end).out;
    return ticket;
}

}  // namespace

std::int32_t satchel_get_validated_tm_ticket(const std::byte* container, std::uint64_t length,
                                             tm_ticket** ticket, trust::TrustService& service) {
    const std::byte* payload = nullptr;
    std::uint64_t payloadLength = 0;
    if (satchel_get_validated_payload(container, length, &payload, &payloadLength, service) != kAccepted) {
        return kRefused;
    }
    // A payload's length has 32 bits in the container.
    return tm_ticket_decode(payload, static_cast<std::int64_t>(payloadLength), ticket);
}

TicketPointer genuineTicket(ByteView container, trust::TrustService& service) {
    tm_ticket* ticket = nullptr;
    satchel_get_validated_tm_ticket(container.data(), container.size(), &ticket, service);
    return TicketPointer(ticket);
}

std::int32_t tm_ticket_decode(const std::byte* payload, std::int64_t size, tm_ticket** ticket) {
    if (std::cmp_less(size, kTicketHeaderSize) || std::cmp_greater(size, kTicketMaximumSize)) return kRefused;
    if (payload == nullptr || ticket == nullptr) return kRefused;

    const ByteView bytes(payload, static_cast<std::size_t>(size));
    const TicketSurvey survey = surveyTicketPayload(bytes);
    if (survey.fault) return kRefused;

    ByteReader reader(bytes);
    reader.seek(4, "version, hash length and count");
    const ByteView versionToCount = reader.bytes(8, "version, hash length and count");
    const ByteView flags = reader.bytes(4, "ticket flags");
    const ByteView signatureTime = reader.bytes(8, "ticket signature time");
    const ByteView entries = reader.bytes(reader.remaining(), "ticket entries");
    TicketPointer made = makeBlock(bytes.size(), {versionToCount, signatureTime, flags, entries});
    if (made == nullptr) return kRefused;
    *ticket = made.release();
    return kAccepted;
}

tm_ticket* tm_ticket_copy(const tm_ticket* ticket) {
    const std::uint64_t size = sizeOfPayload(blockHeader(ticket));
    return makeBlock(size, {blockBytes(ticket, size)}).release();
}

void tm_ticket_free(tm_ticket* ticket) noexcept {
    delete[] ticket;
}

std::uint16_t tm_ticket_get_version(const tm_ticket* ticket) {
    return blockHeader(ticket).version;
}
std::uint64_t tm_ticket_get_signature_time(const tm_ticket* ticket) {
    return blockHeader(ticket).signatureTime;
}
std::uint32_t tm_ticket_get_flags(const tm_ticket* ticket) {
    return blockHeader(ticket).flags;
}
std::uint32_t tm_ticket_get_cdhash_count(const tm_ticket* ticket) {
    return blockHeader(ticket).count;
}

std::int32_t tm_ticket_copy_cdhash(const tm_ticket* ticket, std::uint64_t index, tm_cdhash* cdhash) {
    if (cdhash == nullptr) return kRefused;
    const TicketFields header = blockHeader(ticket);
    if (index >= header.count) return kRefused;

    const std::uint64_t entrySize = sizeOfEntry(header);
    ByteReader entry = ByteReader(blockBytes(ticket, sizeOfPayload(header)))
                           .sub(kBlockHeaderSize + index * entrySize, entrySize, "entry");
    return copyEntry(entry, header.version, header.hashLength, cdhash);
}

bool ticketRevokes(const tm_ticket* ticket) {
    return (tm_ticket_get_flags(ticket) & kTicketRevoked) != 0;
}

std::vector<base::Data> hashesInTicket(const tm_ticket* ticket) {
    std::vector<base::Data> hashes;
    const std::uint32_t count = tm_ticket_get_cdhash_count(ticket);
    for (std::uint32_t index = 0; index < count; ++index) {
        tm_cdhash entry{};
        if (tm_ticket_copy_cdhash(ticket, index, &entry) == kAccepted)
            hashes.emplace_back(entry.hash.begin(), entry.hash.begin() + entry.length);
    }
    return hashes;
}

bool ticketListsHash(const tm_ticket* ticket, ByteView cdhash) {
    const std::uint32_t count = tm_ticket_get_cdhash_count(ticket);
    for (std::uint32_t index = 0; index < count; ++index) {
        tm_cdhash entry{};
        if (tm_ticket_copy_cdhash(ticket, index, &entry) != kAccepted) continue;
        if (std::ranges::equal(ByteView(entry.hash).first(entry.length), cdhash)) return true;
    }
    return false;
}

std::uint64_t TicketSurvey::entrySize() const {
    return sizeOfEntry(version, hashLength);
}

TicketSurvey surveyTicketPayload(ByteView payload) {
    TicketSurvey survey;
    if (payload.size() < kTicketHeaderSize) {
        survey.fault = {payload.size(), "the payload ends inside its header"};
        return survey;
    }
    ByteReader reader(payload);
    const bool magic =
        std::ranges::equal(reader.bytes(kTicketMagic.size(), "ticket magic"), asBytes(kTicketMagic));
    const TicketFields stored = readPayloadHeader(reader);
    survey.header = stored;
    survey.fault = findFault(payload, stored, magic);
    survey.entries = reader.bytes(reader.remaining(), "ticket entries");

    const TicketFields layout = likeliestLayout(stored, survey.entries.size());
    survey.version = layout.version;
    survey.hashLength = layout.hashLength;
    survey.count = survey.entries.size() / sizeOfEntry(layout);
    return survey;
}

std::int32_t readSurveyedHash(const TicketSurvey& survey, std::uint64_t index, tm_cdhash* cdhash) {
    if (cdhash == nullptr || index >= survey.count) return kRefused;
    const std::uint64_t size = survey.entrySize();
    return copyEntry(ByteReader(survey.entries).sub(index * size, size, "entry"), survey.version,
                     survey.hashLength, cdhash);
}

std::size_t tm_cdhash_algorithm_get_size(std::uint32_t algorithm) {
    return algorithm < kHashSizes.size() ? kHashSizes[algorithm] : 0;
}

static_assert(kSatchelMaximumCertificates * kSatchelMaximumCertificateSize + kTicketMaximumSize <
                  kLongestTicketHeld / 2,
              "what is cut off belongs to no ticket that is accepted");

std::uint64_t heldOfTicket(std::uint64_t length) {
    return std::min(length, kLongestTicketHeld);
}

std::optional<TicketFault> faultOfTicketLength(std::uint64_t length, std::uint64_t offset) {
    if (heldOfTicket(length) == length) return std::nullopt;
    return TicketFault{offset, "the ticket is too long to be read"};
}

}  // namespace pinwell
