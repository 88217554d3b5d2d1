#include "formats/tm_ticket.h"

#include <gtest/gtest.h>

#include <limits>
#include <span>

#include "base/byte_io.h"
#include "base/bytes.h"
#include "support/ticket_builder.h"

namespace pinwell {
namespace {

using base::ByteWriter;
using base::Data;
using test::hashOf;
using test::TicketPayloadBuilder;

TicketPointer decode(const Data& payload) {
    tm_ticket* ticket = nullptr;
    const std::int32_t result =
        tm_ticket_decode(payload.data(), static_cast<std::int64_t>(payload.size()), &ticket);
    EXPECT_EQ(result, ticket != nullptr ? 0 : -1);
    return TicketPointer(ticket);
}

bool accepts(const TicketPayloadBuilder& payload) {
    return decode(payload.build()) != nullptr;
}

// Only the hash, without the record's padding.
Data hashAt(const TicketPointer& ticket, std::uint64_t index) {
    tm_cdhash record;
    if (tm_ticket_copy_cdhash(ticket.get(), index, &record) != 0) return {};
    const auto hash = std::span(record.hash).first(record.length);
    return {hash.begin(), hash.end()};
}

// That many entries of zeros, with the correct count.
TicketPayloadBuilder zeroEntries(std::uint16_t version, std::uint16_t hashLength, std::size_t count) {
    const std::size_t entrySize = version == 2 ? hashLength + 1U : hashLength;
    TicketPayloadBuilder builder;
    builder.version(version).hashLength(hashLength).count(static_cast<std::uint32_t>(count));
    return builder.trailing(Data(count * entrySize));
}

TEST(TicketPayload, ReadsEveryFieldOfAVersion2Ticket) {
    const TicketPointer ticket = decode(TicketPayloadBuilder()
                                            .version(2)
                                            .flags(0x80000001)
                                            .signatureTime(0x8877665544332211)
                                            .entry(2, hashOf(10))
                                            .entry(3, hashOf(50))
                                            .build());
    ASSERT_NE(ticket, nullptr);
    EXPECT_EQ(tm_ticket_get_version(ticket.get()), 2);
    EXPECT_EQ(tm_ticket_get_flags(ticket.get()), 0x80000001U);
    EXPECT_EQ(tm_ticket_get_signature_time(ticket.get()), 0x8877665544332211U);
    ASSERT_EQ(tm_ticket_get_cdhash_count(ticket.get()), 2U);
    tm_cdhash record;
    ASSERT_EQ(tm_ticket_copy_cdhash(ticket.get(), 1, &record), 0);
    EXPECT_EQ(record.algorithm, 3U);
    EXPECT_EQ(record.length, 20);
    EXPECT_EQ(hashAt(ticket, 0), hashOf(10));
    EXPECT_EQ(hashAt(ticket, 1), hashOf(50));
}

TEST(TicketPayload, ReadsEveryFieldOfAVersion1Ticket) {
    const TicketPointer ticket =
        decode(TicketPayloadBuilder().version(1).revoked().entry(0, hashOf(10)).entry(0, hashOf(50)).build());
    ASSERT_NE(ticket, nullptr);
    EXPECT_EQ(tm_ticket_get_version(ticket.get()), 1);
    EXPECT_EQ(tm_ticket_get_flags(ticket.get()), kTicketRevoked);
    ASSERT_EQ(tm_ticket_get_cdhash_count(ticket.get()), 2U);
    tm_cdhash record;
    ASSERT_EQ(tm_ticket_copy_cdhash(ticket.get(), 1, &record), 0);
    EXPECT_EQ(record.algorithm, 0U);
    EXPECT_EQ(record.length, 20);
    EXPECT_EQ(hashAt(ticket, 0), hashOf(10));
    EXPECT_EQ(hashAt(ticket, 1), hashOf(50));
}

// The only payload here that no builder has made.
TEST(TicketPayload, IsLittleEndianThroughout) {
    constexpr std::uint8_t kPayload[] = {'m',  '8',  't',  'k',   // magic
                                         0x02, 0x00, 0x14, 0x00,  // version 2, hash length 20
                                         0x01, 0x00, 0x00, 0x00,  // one entry
                                         0x04, 0x03, 0x02, 0x01,  // flags
                                         0x08, 0x07, 0x06, 0x05, 0x04, 0x03, 0x02, 0x01,  // signature time
                                         0x02, 1,    2,    3,    4,    5,    6,    7,    8,  9, 10,
                                         11,   12,   13,   14,   15,   16,   17,   18,   19, 20};
    const auto bytes = std::as_bytes(std::span(kPayload));
    const TicketPointer ticket = decode({bytes.begin(), bytes.end()});
    ASSERT_NE(ticket, nullptr);
    EXPECT_EQ(tm_ticket_get_flags(ticket.get()), 0x01020304U);
    EXPECT_EQ(tm_ticket_get_signature_time(ticket.get()), 0x0102030405060708U);
    EXPECT_EQ(hashAt(ticket, 0), hashOf(1));
}

TEST(TicketPayload, OfTheHeaderAloneIsATicketWithoutEntries) {
    const Data payload = TicketPayloadBuilder().count(0).build();
    ASSERT_EQ(payload.size(), 24U);
    const TicketPointer ticket = decode(payload);
    ASSERT_NE(ticket, nullptr);
    EXPECT_EQ(tm_ticket_get_cdhash_count(ticket.get()), 0U);
    tm_cdhash record;
    EXPECT_EQ(tm_ticket_copy_cdhash(ticket.get(), 0, &record), -1);
}

TEST(TicketPayload, RefusesAMagicThatDiffersInAnyByte) {
    for (std::size_t i = 0; i < kTicketMagic.size(); ++i) {
        std::string magic(kTicketMagic);
        magic[i] ^= 1;
        EXPECT_FALSE(accepts(TicketPayloadBuilder().magic(magic))) << magic;
    }
}

TEST(TicketPayload, AcceptsVersions1And2Alone) {
    EXPECT_TRUE(accepts(TicketPayloadBuilder().version(1)));
    EXPECT_TRUE(accepts(TicketPayloadBuilder().version(2)));
    EXPECT_FALSE(accepts(TicketPayloadBuilder().version(0)));
    EXPECT_FALSE(accepts(TicketPayloadBuilder().version(3)));
    EXPECT_FALSE(accepts(TicketPayloadBuilder().version(0x0100)));
    EXPECT_FALSE(accepts(TicketPayloadBuilder().version(0x0201)));
    EXPECT_FALSE(accepts(TicketPayloadBuilder().version(0xFFFF)));
}

TEST(TicketPayload, RefusesAHashLengthOf32) {
    EXPECT_FALSE(accepts(TicketPayloadBuilder().hashLength(32)));
}

TEST(TicketPayload, RefusesEveryHashLengthBut20And48) {
    for (std::uint32_t length = 0; length <= 0xFFFF; ++length) {
        const bool permitted = length == 20 || length == 48;
        ASSERT_EQ(accepts(TicketPayloadBuilder().hashLength(static_cast<std::uint16_t>(length))), permitted)
            << length;
    }
}

TEST(TicketPayload, RefusesASizeThatLacksTheAlgorithmBytes) {
    EXPECT_FALSE(accepts(TicketPayloadBuilder().version(2).count(2).trailing(hashOf(1)).trailing(hashOf(2))));
    EXPECT_TRUE(accepts(TicketPayloadBuilder().version(1).count(2).trailing(hashOf(1)).trailing(hashOf(2))));
}

TEST(TicketPayload, RefusesAVersion1SizeThatHasAlgorithmBytes) {
    EXPECT_FALSE(accepts(zeroEntries(2, 20, 2).version(1)));
}

TEST(TicketPayload, RefusesOneByteAfterTheEntries) {
    EXPECT_FALSE(accepts(TicketPayloadBuilder().entry(2, hashOf(1)).trailing(Data(1))));
}

TEST(TicketPayload, RefusesEveryPrefix) {
    const Data payload = TicketPayloadBuilder().entry(2, hashOf(1)).entry(1, hashOf(2)).build();
    for (std::size_t size = 0; size < payload.size(); ++size) {
        // In its own buffer, so that a read after its end is detected.
        const Data prefix(payload.begin(), payload.begin() + static_cast<std::ptrdiff_t>(size));
        ASSERT_EQ(decode(prefix), nullptr) << size;
    }
    EXPECT_NE(decode(payload), nullptr);
}

TEST(TicketPayload, RefusesACountThatTheSizeDoesNotBearOut) {
    EXPECT_FALSE(accepts(TicketPayloadBuilder().count(0).entry(2, hashOf(1))));
    EXPECT_FALSE(accepts(TicketPayloadBuilder().count(2).entry(2, hashOf(1))));
    EXPECT_FALSE(accepts(TicketPayloadBuilder().count(0xFFFFFFFF).entry(2, hashOf(1))));
    // 2^30 entries of 20 bytes are a multiple of 2^32: right only for sums of 32 bits.
    EXPECT_FALSE(accepts(TicketPayloadBuilder().version(1).count(0x40000000)));
}

// No whole number of entries of any size ends at 16 MiB or one byte after it. So the nearest payloads on
// either side show the limit.
TEST(TicketPayload, AcceptsTheLargestTicketOf16MiBOrLess) {
    const Data payload = zeroEntries(1, 20, 838859).build();
    ASSERT_EQ(payload.size(), 16777204U);
    const TicketPointer ticket = decode(payload);
    ASSERT_NE(ticket, nullptr);
    EXPECT_EQ(hashAt(ticket, 838858), Data(20));
}

TEST(TicketPayload, RefusesTheSmallestTicketOfMoreThan16MiB) {
    const Data payload = zeroEntries(2, 20, 798914).build();
    ASSERT_EQ(payload.size(), 16777218U);
    EXPECT_EQ(decode(payload), nullptr);
}

TEST(TicketPayload, Refuses16MiBAndOneByteMoreSinceNoCountIsConsistentWithThem) {
    for (const std::size_t size : {kTicketMaximumSize, kTicketMaximumSize + 1}) {
        for (const std::uint16_t version : {std::uint16_t{1}, std::uint16_t{2}}) {
            for (const std::uint16_t hashLength : {std::uint16_t{20}, std::uint16_t{48}}) {
                const std::size_t entries = size - kTicketHeaderSize;
                const std::size_t entrySize = hashLength + version - 1U;
                EXPECT_NE(entries % entrySize, 0U);
                const auto count = static_cast<std::uint32_t>(entries / entrySize);
                const Data payload =
                    zeroEntries(version, hashLength, count).trailing(Data(entries % entrySize)).build();
                ASSERT_EQ(payload.size(), size);
                EXPECT_EQ(decode(payload), nullptr) << size << " " << entrySize;
            }
        }
    }
}

TEST(TicketPayload, LooksAtNoByteOfAPayloadWhoseSizeIsOutOfRange) {
    const Data payload = TicketPayloadBuilder().build();
    tm_ticket* ticket = nullptr;
    for (const std::int64_t size : {std::int64_t{-1}, std::numeric_limits<std::int64_t>::min(),
                                    std::numeric_limits<std::int64_t>::max(), std::int64_t{0},
                                    std::int64_t{23}, std::int64_t{16777217}}) {
        EXPECT_EQ(tm_ticket_decode(payload.data(), size, &ticket), -1) << size;
    }
    EXPECT_EQ(ticket, nullptr);
}

TEST(TicketPayload, RefusesAMissingPayloadOrPlaceForTheTicket) {
    const Data payload = TicketPayloadBuilder().build();
    tm_ticket* ticket = nullptr;
    EXPECT_EQ(tm_ticket_decode(nullptr, 24, &ticket), -1);
    EXPECT_EQ(ticket, nullptr);
    EXPECT_EQ(tm_ticket_decode(payload.data(), 24, nullptr), -1);
}

TEST(TicketPayload, WritesTheTicketOnlyOnSuccess) {
    const TicketPointer before = decode(TicketPayloadBuilder().build());
    tm_ticket* ticket = before.get();
    const Data payload = TicketPayloadBuilder().version(3).build();
    EXPECT_EQ(tm_ticket_decode(payload.data(), static_cast<std::int64_t>(payload.size()), &ticket), -1);
    EXPECT_EQ(ticket, before.get());
}

TEST(Ticket, DoesNotNeedThePayloadItWasDecodedFrom) {
    TicketPointer ticket;
    {
        Data payload = TicketPayloadBuilder().entry(2, hashOf(7)).build();
        ticket = decode(payload);
        payload.assign(payload.size(), std::byte{0xFF});
    }
    ASSERT_NE(ticket, nullptr);
    EXPECT_EQ(hashAt(ticket, 0), hashOf(7));
}

class TicketOfUnusableEntries : public testing::TestWithParam<std::uint8_t> {};

TEST_P(TicketOfUnusableEntries, DecodesAndKeepsTheOthersUsable) {
    const TicketPointer ticket = decode(TicketPayloadBuilder()
                                            .version(2)
                                            .entry(1, hashOf(10))
                                            .entry(GetParam(), hashOf(20))
                                            .entry(2, hashOf(30))
                                            .build());
    ASSERT_NE(ticket, nullptr);
    EXPECT_EQ(hashAt(ticket, 0), hashOf(10));
    EXPECT_EQ(hashAt(ticket, 1), Data());
    EXPECT_EQ(hashAt(ticket, 2), hashOf(30));
}

// 4 is known, but its 48 bytes are not there.
INSTANTIATE_TEST_SUITE_P(Algorithm, TicketOfUnusableEntries, testing::Values(0, 4, 5, 0x80, 0xFF));

TEST(TicketEntry, OfAlgorithm4Has48Bytes) {
    const TicketPointer ticket =
        decode(TicketPayloadBuilder().hashLength(48).entry(4, hashOf(1, 48)).build());
    ASSERT_NE(ticket, nullptr);
    tm_cdhash record;
    ASSERT_EQ(tm_ticket_copy_cdhash(ticket.get(), 0, &record), 0);
    EXPECT_EQ(record.algorithm, 4U);
    EXPECT_EQ(record.length, 48);
    EXPECT_EQ(hashAt(ticket, 0), hashOf(1, 48));
}

TEST(TicketEntry, OfAlgorithm1InATicketOfHashLength48IsTheFirst20Bytes) {
    const TicketPointer ticket = decode(
        TicketPayloadBuilder().hashLength(48).entry(1, hashOf(1, 48)).entry(4, hashOf(100, 48)).build());
    ASSERT_NE(ticket, nullptr);
    EXPECT_EQ(hashAt(ticket, 0), hashOf(1, 20));
    EXPECT_EQ(hashAt(ticket, 1), hashOf(100, 48));
}

TEST(TicketEntry, OfAVersion1TicketHas20BytesWhateverTheHashLength) {
    const TicketPointer ticket = decode(TicketPayloadBuilder()
                                            .version(1)
                                            .hashLength(48)
                                            .entry(0, hashOf(1, 48))
                                            .entry(0, hashOf(100, 48))
                                            .build());
    ASSERT_NE(ticket, nullptr);
    EXPECT_EQ(hashAt(ticket, 0), hashOf(1, 20));
    EXPECT_EQ(hashAt(ticket, 1), hashOf(100, 20));
}

TEST(TicketEntry, LeavesZerosAfterTheHash) {
    const TicketPointer ticket = decode(TicketPayloadBuilder().entry(2, Data(20, std::byte{0xEE})).build());
    ASSERT_NE(ticket, nullptr);
    tm_cdhash record;
    record.hash.fill(std::byte{0xAA});
    ASSERT_EQ(tm_ticket_copy_cdhash(ticket.get(), 0, &record), 0);
    for (std::size_t i = 0; i < record.hash.size(); ++i) {
        EXPECT_EQ(record.hash[i], i < 20 ? std::byte{0xEE} : std::byte{0}) << i;
    }
}

TEST(TicketEntry, IsRefusedAtOrAfterTheCount) {
    const TicketPointer ticket =
        decode(TicketPayloadBuilder().entry(2, hashOf(1)).entry(2, hashOf(2)).build());
    ASSERT_NE(ticket, nullptr);
    tm_cdhash record;
    EXPECT_EQ(tm_ticket_copy_cdhash(ticket.get(), 1, &record), 0);
    for (const std::uint64_t index :
         {std::uint64_t{2}, std::uint64_t{1} << 32U, (std::uint64_t{1} << 32U) + 1,  // 1, when cut to 32 bits
          std::numeric_limits<std::uint64_t>::max()}) {
        EXPECT_EQ(tm_ticket_copy_cdhash(ticket.get(), index, &record), -1) << index;
    }
}

TEST(TicketEntry, IsRefusedWithoutAPlaceForIt) {
    const TicketPointer ticket = decode(TicketPayloadBuilder().entry(2, hashOf(1)).build());
    ASSERT_NE(ticket, nullptr);
    EXPECT_EQ(tm_ticket_copy_cdhash(ticket.get(), 0, nullptr), -1);
}

TEST(TicketEntry, LeavesTheRecordAloneWhenItIsRefused) {
    const TicketPointer ticket = decode(TicketPayloadBuilder().entry(5, hashOf(1)).build());
    ASSERT_NE(ticket, nullptr);
    tm_cdhash record;
    record.algorithm = 77;
    record.length = 7;
    record.hash.fill(std::byte{0x77});
    const tm_cdhash before = record;
    EXPECT_EQ(tm_ticket_copy_cdhash(ticket.get(), 0, &record), -1);
    EXPECT_EQ(record.algorithm, before.algorithm);
    EXPECT_EQ(record.length, before.length);
    EXPECT_EQ(record.hash, before.hash);
}

TEST(TicketCopy, HoldsTheSameAndOutlivesTheOriginal) {
    TicketPointer original = decode(TicketPayloadBuilder()
                                        .hashLength(48)
                                        .revoked()
                                        .signatureTime(1234567890123)
                                        .entry(4, hashOf(1, 48))
                                        .entry(2, hashOf(2, 48))
                                        .build());
    ASSERT_NE(original, nullptr);
    const TicketPointer copy(tm_ticket_copy(original.get()));
    ASSERT_NE(copy, nullptr);
    ASSERT_NE(copy, original);
    original.reset();
    const TicketPointer second(tm_ticket_copy(copy.get()));
    ASSERT_NE(second, nullptr);
    EXPECT_EQ(tm_ticket_get_version(second.get()), 2);
    EXPECT_EQ(tm_ticket_get_flags(second.get()), kTicketRevoked);
    EXPECT_EQ(tm_ticket_get_signature_time(second.get()), 1234567890123U);
    ASSERT_EQ(tm_ticket_get_cdhash_count(second.get()), 2U);
    EXPECT_EQ(hashAt(second, 0), hashOf(1, 48));
    EXPECT_EQ(hashAt(second, 1), hashOf(2, 20));
}

TEST(TicketCopy, OfATicketWithoutEntries) {
    const TicketPointer original = decode(TicketPayloadBuilder().build());
    const TicketPointer copy(tm_ticket_copy(original.get()));
    ASSERT_NE(copy, nullptr);
    EXPECT_EQ(tm_ticket_get_cdhash_count(copy.get()), 0U);
}

TEST(Ticket, MayBeFreedWhenThereIsNone) {
    EXPECT_NO_THROW(tm_ticket_free(nullptr));
}

TEST(CdhashAlgorithm, GivesTheSizeOfItsHash) {
    EXPECT_EQ(tm_cdhash_algorithm_get_size(0), 20U);
    EXPECT_EQ(tm_cdhash_algorithm_get_size(1), 20U);
    EXPECT_EQ(tm_cdhash_algorithm_get_size(2), 20U);
    EXPECT_EQ(tm_cdhash_algorithm_get_size(3), 20U);
    EXPECT_EQ(tm_cdhash_algorithm_get_size(4), 48U);
    EXPECT_EQ(tm_cdhash_algorithm_get_size(5), 0U);
    EXPECT_EQ(tm_cdhash_algorithm_get_size(std::numeric_limits<std::uint32_t>::max()), 0U);
}

}  // namespace
}  // namespace pinwell
