// Tickets taken apart through the public interface.
#include <gtest/gtest.h>
#include <pinwell/ticket.h>

#include <limits>

#include "support/ticket_builder.h"

namespace pinwell::test {
namespace {

using foundation::Data;
using ticket::ByteView;

Data dataOf(ByteView bytes) {
    return {bytes.begin(), bytes.end()};
}

Data samplePayload() {
    return TicketPayloadBuilder()
        .flags(6)
        .signatureTime(1'700'000'000)
        .entry(2, hashOf(7))
        .entry(1, hashOf(9))
        .build();
}

/// The error of a refusal; a failure of the test when there is none.
template <class T>
ticket::Error refusalOf(const ticket::Result<T>& result) {
    const auto* const error = std::get_if<ticket::Error>(&result);
    EXPECT_NE(error, nullptr) << "not refused";
    return error == nullptr ? ticket::Error{} : *error;
}

TEST(TicketLibrary, IsTheVersionThatItsHeaderIs) {
    EXPECT_EQ(ticket::version(), static_cast<std::uint32_t>(PINWELL_TICKET_VERSION));
}

TEST(TicketLibraryContainer, IsLocatedInTheCallersBytes) {
    const IssuedChain chain = TicketChain().issue();
    const Data bytes = SatchelBuilder::of(chain, samplePayload()).reserved(77).build();
    const auto result = ticket::decodeContainer(bytes);
    const auto* const container = std::get_if<ticket::Container>(&result);
    ASSERT_NE(container, nullptr);
    EXPECT_EQ(container->version, 1);
    EXPECT_EQ(container->reserved, 77);
    ASSERT_EQ(container->certificates.size(), 3U);
    EXPECT_EQ(dataOf(container->certificates[0]), chain.leaf.der);
    EXPECT_EQ(dataOf(container->certificates[2]), chain.root.der);
    EXPECT_EQ(dataOf(container->payload), samplePayload());
    EXPECT_EQ(container->signedBytes.data(), bytes.data());
    EXPECT_EQ(container->signedBytes.size(), bytes.size() - 72);
    EXPECT_EQ(container->signature.data(), bytes.data() + bytes.size() - 72);
    EXPECT_EQ(container->signature.size(), 72U);
}

TEST(TicketLibraryContainer, IsRefusedWithRuleAndOffset) {
    const SatchelBuilder sound = SatchelBuilder::of(TicketChain().issue(), samplePayload());
    const auto refusal = [](SatchelBuilder builder) {
        return refusalOf(ticket::decodeContainer(builder.build()));
    };

    const ticket::Error magic = refusal(SatchelBuilder(sound).magic("s8ck"));
    EXPECT_EQ(magic.code, ticket::ErrorCode::malformed);
    EXPECT_EQ(magic.offset, 0U);
    EXPECT_EQ(magic.message, "the container does not begin with its magic, \"s8ch\"");
    EXPECT_EQ(refusal(SatchelBuilder(sound).version(2)).offset, 4U);
    EXPECT_EQ(refusal(SatchelBuilder(sound).payloadLength(1)).offset, 8U);
}

TEST(TicketLibraryContainer, CountsACertificatesOffsetFromTheStartOfTheTicket) {
    const auto refusal =
        refusalOf(ticket::decodeContainer(SatchelBuilder()
                                              .certificates(std::vector<Data>(4, derElementOfSize(100)))
                                              .payload(samplePayload())
                                              .build()));
    EXPECT_EQ(refusal.message, "there are more than three certificates");
    EXPECT_EQ(refusal.offset, 16U + 4U + 3U * 100U);
}

TEST(TicketLibraryContainer, IsRefusedAtEveryLengthButItsOwn) {
    Data bytes = SatchelBuilder::of(TicketChain().issue(), samplePayload()).build();
    for (std::size_t length = 0; length < bytes.size(); ++length)
        EXPECT_FALSE(refusalOf(ticket::decodeContainer(ByteView(bytes).first(length))).message.empty());
    bytes.push_back(std::byte{0});
    EXPECT_EQ(refusalOf(ticket::decodeContainer(bytes)).offset, 8U);
}

TEST(TicketLibraryPayload, HasItsFieldsAndItsEntries) {
    const Data bytes = samplePayload();
    const auto result = ticket::decodePayload(bytes);
    const auto* const payload = std::get_if<ticket::Payload>(&result);
    ASSERT_NE(payload, nullptr);
    EXPECT_EQ(payload->version, 2);
    EXPECT_EQ(payload->hashLength, 20);
    EXPECT_EQ(payload->entryCount, 2U);
    EXPECT_EQ(payload->flags, 6U);
    EXPECT_EQ(payload->signatureTime, 1'700'000'000U);
    EXPECT_FALSE(payload->isMarkedRevoked());
    const auto second = ticket::entryAt(*payload, 1);
    ASSERT_TRUE(second);
    EXPECT_EQ(second->algorithm, 1U);
    EXPECT_EQ(second->hash, hashOf(9));
}

TEST(TicketLibraryPayload, HasNoEntryAfterTheLast) {
    const Data bytes = samplePayload();
    const auto result = ticket::decodePayload(bytes);
    const auto& payload = std::get<ticket::Payload>(result);
    EXPECT_FALSE(ticket::entryAt(payload, 2));
    EXPECT_FALSE(ticket::entryAt(payload, std::numeric_limits<std::uint64_t>::max()));
}

TEST(TicketLibraryPayload, HasNoEntryWhereTheAlgorithmIsUnknownOrTooLong) {
    const Data bytes =
        TicketPayloadBuilder().entry(5, hashOf(1)).entry(4, hashOf(2)).entry(3, hashOf(3)).build();
    const auto result = ticket::decodePayload(bytes);
    const auto& payload = std::get<ticket::Payload>(result);
    EXPECT_EQ(payload.entryCount, 3U);
    EXPECT_FALSE(ticket::entryAt(payload, 0));
    EXPECT_FALSE(ticket::entryAt(payload, 1));
    EXPECT_TRUE(ticket::entryAt(payload, 2));
}

TEST(TicketLibraryPayload, HasNoEntriesWhenItWasNeverDecoded) {
    EXPECT_FALSE(ticket::entryAt(ticket::Payload{}, 0));
}

TEST(TicketLibraryPayload, SaysThatItIsMarkedRevoked) {
    const Data bytes = TicketPayloadBuilder().revoked().build();
    const auto result = ticket::decodePayload(bytes);
    EXPECT_TRUE(std::get<ticket::Payload>(result).isMarkedRevoked());
}

TEST(TicketLibraryPayload, IsRefusedWithRuleAndOffset) {
    const auto refusal = [](const TicketPayloadBuilder& builder) {
        return refusalOf(ticket::decodePayload(builder.build()));
    };
    EXPECT_EQ(refusal(TicketPayloadBuilder().magic("m8tx")).offset, 0U);
    EXPECT_EQ(refusal(TicketPayloadBuilder().version(3)).offset, 4U);
    EXPECT_EQ(refusal(TicketPayloadBuilder().hashLength(32)).offset, 6U);
    EXPECT_EQ(refusal(TicketPayloadBuilder().count(1)).offset, 8U);
    EXPECT_EQ(refusalOf(ticket::decodePayload({})).message, "the payload ends inside its header");
}

}  // namespace
}  // namespace pinwell::test
