#include "formats/disk_image.h"

#include <gtest/gtest.h>

#include <algorithm>

#include "support/disk_image_builder.h"

namespace pinwell {
namespace {

using foundation::Data;
using test::DiskImageBuilder;

UDIFFileHeader headerOf(const DiskImageBuilder& builder) {
    UDIFFileHeader header;
    EXPECT_TRUE(header.assign(builder.trailer()));
    return header;
}

TEST(UDIFHeader, ConvertsItsFieldsFromBigEndian) {
    const auto header =
        headerOf(DiskImageBuilder().codeSignOffset(0x0102030405060708).codeSignLength(0xFF00));
    EXPECT_TRUE(header.hasMagic());
    EXPECT_EQ(header.version(), 4U);
    EXPECT_EQ(header.codeSignOffset(), 0x0102030405060708U);
    EXPECT_EQ(header.codeSignLength(), 0xFF00U);
}

TEST(UDIFHeader, ShowsItsMagicAsALittleEndianNumber) {
    EXPECT_EQ(headerOf(DiskImageBuilder()).magicAsShown(), 0x796C6F6BU);
    EXPECT_EQ(UDIFFileHeader().magicAsShown(), 0U);
    EXPECT_FALSE(UDIFFileHeader().hasMagic());
}

TEST(UDIFHeader, TakesNothingButAWholeTrailer) {
    UDIFFileHeader header;
    Data bytes = DiskImageBuilder().trailer();
    bytes.pop_back();
    EXPECT_FALSE(header.assign(bytes));
    bytes.resize(513);
    EXPECT_FALSE(header.assign(bytes));
    EXPECT_FALSE(header.hasMagic());
}

TEST(UDIFHeader, KeepsEveryByteExceptTheSignatureFields) {
    auto header = headerOf(DiskImageBuilder());
    header.setCodeSign(0x1122334455667788, 0x99);
    const Data expected =
        DiskImageBuilder().codeSignOffset(0x1122334455667788).codeSignLength(0x99).trailer();
    EXPECT_TRUE(std::equal(expected.begin(), expected.end(), header.bytes().begin(), header.bytes().end()));
}

}  // namespace
}  // namespace pinwell
