#include <gtest/gtest.h>

#include <limits>
#include <span>

#include "base/bytes.h"
#include "formats/satchel.h"
#include "support/ticket_builder.h"

namespace pinwell {
namespace {

using base::Data;
using base::toData;
using test::derElementOfSize;
using test::SatchelBuilder;

// One element for a certificate, five bytes of payload.
SatchelBuilder framedSatchel() {
    return SatchelBuilder().certificate(derElementOfSize(30)).payload(toData("hello"));
}

bool decodes(const Data& container) {
    satchel_view view;
    view.version = 99;
    const std::int32_t result = satchel_decode_header(container.data(), container.size(), &view);
    // Whatever the view's earlier value, a refusal clears it.
    EXPECT_EQ(view == satchel_view{}, result != 0);
    return result == 0;
}

TEST(SatchelFraming, LocatesEveryPart) {
    const Data container = framedSatchel().build();
    constexpr std::size_t kBlock = 32;
    ASSERT_EQ(container.size(), 16 + kBlock + 5 + 72);
    satchel_view view;
    ASSERT_EQ(satchel_decode_header(container.data(), container.size(), &view), 0);
    const std::byte* start = container.data();
    EXPECT_EQ(view.certificates, start + 16);
    EXPECT_EQ(view.certificatesLength, kBlock);
    EXPECT_EQ(view.payload, start + 16 + kBlock);
    EXPECT_EQ(view.payloadLength, 5U);
    EXPECT_EQ(view.signature, start + 16 + kBlock + 5);
    EXPECT_EQ(view.signatureLength, 72U);
    EXPECT_EQ(view.signedData, start);
    EXPECT_EQ(view.signedDataLength, 16 + kBlock + 5);
    EXPECT_EQ(view.version, 1);
}

// The only container here that no builder has made.
TEST(SatchelFraming, IsLittleEndianThroughout) {
    constexpr std::uint8_t kHeader[] = {0x73, 0x38, 0x63, 0x68, 0x01, 0x00, 0xAB, 0xCD,
                                        0x02, 0x01, 0x00, 0x00, 0x03, 0x00, 0x00, 0x00};
    const auto header = std::as_bytes(std::span(kHeader));
    Data container(header.begin(), header.end());
    container.resize(16 + 0x102 + 3 + 72);
    satchel_view view;
    ASSERT_EQ(satchel_decode_header(container.data(), container.size(), &view), 0);
    EXPECT_EQ(view.certificatesLength, 0x102U);
    EXPECT_EQ(view.payloadLength, 3U);
}

TEST(SatchelFraming, RefusesAMagicThatDiffersInAnyByte) {
    for (std::size_t i = 0; i < kSatchelMagic.size(); ++i) {
        std::string magic(kSatchelMagic);
        magic[i] ^= 1;
        EXPECT_FALSE(decodes(framedSatchel().magic(magic).build())) << magic;
    }
}

TEST(SatchelFraming, AcceptsVersion1Alone) {
    EXPECT_TRUE(decodes(framedSatchel().version(1).build()));
    EXPECT_FALSE(decodes(framedSatchel().version(0).build()));
    EXPECT_FALSE(decodes(framedSatchel().version(2).build()));
    EXPECT_FALSE(decodes(framedSatchel().version(0x0100).build()));
    EXPECT_FALSE(decodes(framedSatchel().version(0x0101).build()));
}

TEST(SatchelFraming, DoesNotReadTheReservedField) {
    EXPECT_TRUE(decodes(framedSatchel().reserved(0xFFFF).build()));
}

TEST(SatchelFraming, DecodesWithoutACertificateBlock) {
    const Data container = SatchelBuilder().certificateBlock({}).payload(toData("hello")).build();
    satchel_view view;
    ASSERT_EQ(satchel_decode_header(container.data(), container.size(), &view), 0);
    EXPECT_EQ(view.certificatesLength, 0U);
    EXPECT_EQ(view.payload, container.data() + 16);
}

TEST(SatchelFraming, RefusesAnEmptyPayload) {
    EXPECT_FALSE(decodes(framedSatchel().payload({}).build()));
}

TEST(SatchelFraming, RefusesOneByteMore) {
    Data container = framedSatchel().build();
    container.push_back(std::byte{0});
    EXPECT_FALSE(decodes(container));
}

TEST(SatchelFraming, RefusesEveryPrefix) {
    const Data container = framedSatchel().build();
    for (std::size_t size = 0; size < container.size(); ++size) {
        // In its own buffer, so that a read after its end is detected.
        const Data prefix(container.begin(), container.begin() + static_cast<std::ptrdiff_t>(size));
        ASSERT_FALSE(decodes(prefix)) << size;
    }
    EXPECT_TRUE(decodes(container));
}

TEST(SatchelFraming, RefusesLengthsThatDoNotAddUp) {
    EXPECT_FALSE(decodes(framedSatchel().certificateBlockLength(31).build()));
    EXPECT_FALSE(decodes(framedSatchel().certificateBlockLength(33).build()));
    EXPECT_FALSE(decodes(framedSatchel().payloadLength(4).build()));
    EXPECT_FALSE(decodes(framedSatchel().payloadLength(6).build()));
    EXPECT_FALSE(
        decodes(framedSatchel().certificateBlockLength(0xFFFFFFFF).payloadLength(0xFFFFFFFF).build()));
}

TEST(SatchelFraming, RefusesLengthsThatAddUpIn32BitsAlone) {
    constexpr std::uint32_t kTooMuch = 0xFFFFFFF0;
    EXPECT_FALSE(
        decodes(framedSatchel().certificateBlockLength(kTooMuch).payloadLength(37 - kTooMuch).build()));
    EXPECT_FALSE(
        decodes(framedSatchel().certificateBlockLength(37 - kTooMuch).payloadLength(kTooMuch).build()));
}

TEST(SatchelFraming, RefusesALengthThatWrapsTheAddressSpace) {
    const Data container = framedSatchel().build();
    satchel_view view;
    view.version = 99;
    EXPECT_EQ(satchel_decode_header(container.data(), std::numeric_limits<std::uint64_t>::max(), &view), -1);
    EXPECT_EQ(view, satchel_view{});
}

TEST(SatchelFraming, RefusesAMissingContainer) {
    satchel_view view;
    view.version = 99;
    EXPECT_EQ(satchel_decode_header(nullptr, 125, &view), -1);
    EXPECT_EQ(view, satchel_view{});
}

TEST(SatchelFraming, RefusesAMissingView) {
    const Data container = framedSatchel().build();
    EXPECT_EQ(satchel_decode_header(container.data(), container.size(), nullptr), -1);
}

}  // namespace
}  // namespace pinwell
