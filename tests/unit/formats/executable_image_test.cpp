#include "formats/executable_image.h"

#include <gtest/gtest.h>

namespace pinwell {
namespace {

using base::ByteWriter;
using base::Data;

TEST(ImageHeader, IsReadInTheOrderThatItsMagicShows) {
    ByteWriter big;
    big.be32(kImageMagic32).be32(7).be32(8).be32(2).be32(3).be32(40).be32(0);
    ByteWriter little;
    little.le32(kImageMagic64).le32(7).le32(8).le32(2).le32(3).le32(40).le32(0);
    for (const ByteWriter* const image : {&big, &little}) {
        const auto header = readImageHeader(image->data());
        ASSERT_TRUE(header);
        EXPECT_EQ(header->form.isBigEndian, image == &big);
        EXPECT_EQ(header->form.is64, image == &little);
        EXPECT_EQ(header->form.headerSize(), image == &big ? 28U : 32U);
        EXPECT_EQ(header->cpuType, 7U);
        EXPECT_EQ(header->cpuSubtype, 8U);
        EXPECT_EQ(header->fileType, kFileTypeExecutable);
        EXPECT_EQ(header->commandCount, 3U);
        EXPECT_EQ(header->commandsSize, 40U);
    }
}

TEST(ImageHeader, IsNulloptForAnotherMagic) {
    for (const std::uint32_t magic : {0xFEEDFACDU, kUniversalMagic32, kUniversalMagic64})
        EXPECT_FALSE(readImageHeader(ByteWriter().be32(magic).zeros(24).data()));
}

TEST(ImageHeader, ThrowsIfTheBytesEndInIt) {
    EXPECT_THROW(readImageHeader(ByteWriter().be32(kImageMagic64).zeros(12).data()), base::ShortRead);
    EXPECT_THROW(readImageHeader(Data(3)), base::ShortRead);
}

TEST(UniversalHeader, CountsTheBytesOfItsList) {
    const auto narrow = readUniversalHeader(ByteWriter().be32(kUniversalMagic32).be32(3).data());
    const auto wide = readUniversalHeader(ByteWriter().be32(kUniversalMagic64).be32(~0U).data());
    ASSERT_TRUE(narrow && wide);
    EXPECT_EQ(narrow->listSize(), 3U * 20U);
    EXPECT_EQ(wide->listSize(), 0xFFFFFFFFULL * 32U);
    EXPECT_FALSE(readUniversalHeader(ByteWriter().le32(kUniversalMagic32).be32(3).data()));
    EXPECT_THROW(readUniversalHeader(ByteWriter().be32(kUniversalMagic32).data()), base::ShortRead);
}

TEST(UniversalEntry, HasLongPlacesAndASpareFieldInTheWideList) {
    const auto narrow =
        readUniversalEntry(ByteWriter().be32(1).be32(2).be32(3).be32(4).be32(5).data(), {false, 1});
    EXPECT_EQ(narrow.offset, 3U);
    EXPECT_EQ(narrow.length, 4U);
    EXPECT_EQ(narrow.alignment, 5U);
    const auto wide =
        readUniversalEntry(ByteWriter().be32(1).be32(2).be64(3).be64(4).be32(5).be32(6).data(), {true, 1});
    EXPECT_EQ(wide.cpuType, 1U);
    EXPECT_EQ(wide.cpuSubtype, 2U);
    EXPECT_EQ(wide.offset, 3U);
    EXPECT_EQ(wide.length, 4U);
    EXPECT_EQ(wide.alignment, 5U);
    EXPECT_EQ(wide.spare, 6U);
    EXPECT_THROW(readUniversalEntry(Data(31), {true, 1}), base::ShortRead);
}

}  // namespace
}  // namespace pinwell
