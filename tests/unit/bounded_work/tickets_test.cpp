#include <gtest/gtest.h>

#include "allocation_count.h"
#include "formats/satchel.h"
#include "formats/tm_ticket.h"
#include "support/fake_trust_service.h"
#include "support/ticket_builder.h"
#include "trust/certificate.h"
#include "trust/der.h"

namespace pinwell::test {
namespace {

using base::Data;

TEST(BoundedWork, TicketOfTheMostEntriesTakesOneBlockOfItsSize) {
    constexpr std::size_t kEntries = (kTicketMaximumSize - kTicketHeaderSize) / 20;
    const Data payload =
        TicketPayloadBuilder().version(1).count(kEntries).trailing(Data(kEntries * 20)).build();
    ASSERT_GT(payload.size(), kTicketMaximumSize - 20);

    const AllocationCount count;
    tm_ticket* decoded = nullptr;
    ASSERT_EQ(tm_ticket_decode(payload.data(), static_cast<std::int64_t>(payload.size()), &decoded), 0);
    const TicketPointer ticket(decoded);
    for (std::uint32_t i = 0; i < kEntries; ++i) {
        tm_cdhash hash;
        ASSERT_EQ(tm_ticket_copy_cdhash(decoded, i, &hash), 0);
    }
    EXPECT_EQ(count.blocks(), 1U);
    EXPECT_LE(count.bytes(), payload.size());
}

TEST(BoundedWork, TicketThatClaimsFourBillionEntriesTakesNothing) {
    const Data payload = TicketPayloadBuilder().count(~0U).build();
    const AllocationCount count;
    tm_ticket* decoded = nullptr;
    EXPECT_EQ(tm_ticket_decode(payload.data(), static_cast<std::int64_t>(payload.size()), &decoded), -1);
    EXPECT_EQ(count.blocks(), 0U);
}

TEST(BoundedWork, ContainerThatClaimsEightGibibytesTakesNothing) {
    const Data container = SatchelBuilder()
                               .certificate(derElement(0x30, {}))
                               .payload(base::toData("payload"))
                               .certificateBlockLength(~0U)
                               .payloadLength(~0U)
                               .build();
    const AllocationCount count;
    satchel_view view;
    EXPECT_EQ(satchel_decode_header(container.data(), container.size(), &view), -1);
    EXPECT_EQ(count.blocks(), 0U);
}

TEST(BoundedWork, BlockOfAMillionCertificatesIsLeftAfterThree) {
    Data elements;
    const Data element = derElement(0x30, {});
    for (int i = 0; i < 1'000'000; ++i) base::append(elements, element);
    const Data block = derElement(0x30, elements);
    FakeTrustService service;
    std::vector<trust::CertificateRef> certificates;
    EXPECT_EQ(readSatchelCertificates(block, &certificates, service), satchel_status::kBadCertificates);
    EXPECT_EQ(service.parsedCertificates.size(), 3U);
}

TEST(BoundedWork, CertificateOfFourGibibytesIsNotLookedFor) {
    const Data block =
        SatchelBuilder()
            .certificateBlock(derElement(0x30, base::toData(std::string_view("\x30\x84\xFF\xFF\xFF\xFF", 6))))
            .build();
    FakeTrustService service;
    std::vector<trust::CertificateRef> certificates;
    EXPECT_NE(readSatchelCertificates(block, &certificates, service), satchel_status::kSuccess);
    EXPECT_TRUE(service.parsedCertificates.empty());
}

// One element inside the other: the walk through them is a recursion.
TEST(BoundedWork, CertificateOfThousandsOfLevelsIsRefused) {
    Data nested = derElement(0x05, {});
    while (nested.size() < std::size_t{16} * 1024) nested = derElement(0x30, nested);
    const AllocationCount count;
    EXPECT_FALSE(trust::der::isNestedDefinite(nested));
    EXPECT_EQ(trust::X509Certificate::parse(nested), nullptr);
    EXPECT_LE(count.bytes(), kMebibyte);
}

TEST(BoundedWork, CertificateOfSixtyThousandElementsIsRefused) {
    const Data certificate =
        derElement(0x30, Data(trust::kMaximumCertificateSize - 8));  // tag 0, length 0, ...
    ASSERT_TRUE(trust::der::isNestedDefinite(certificate));
    const AllocationCount count;
    EXPECT_EQ(trust::X509Certificate::parse(certificate), nullptr);
    EXPECT_LE(count.bytes(), kMebibyte);
}

}  // namespace
}  // namespace pinwell::test
