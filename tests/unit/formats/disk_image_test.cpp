#include "formats/disk_image.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "formats/explain_ticket.h"
#include "support/collected_diagnostics.h"
#include "support/disk_image_builder.h"
#include "support/memory_reader.h"

namespace pinwell {
namespace {

using base::Data;
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

struct Read {
    DiskImageSignature signature;
    std::vector<std::string> lines;
};

Read readSigned(const DiskImageBuilder& image) {
    test::MemoryReader file(image.build());
    test::CollectedDiagnostics said;
    Read read;
    const bool isImage = readDiskImageTrailer(file, "Sample.dmg", read.signature, said.diagnostics()) &&
                         readDiskImageSuperblob(file, "Sample.dmg", read.signature, said.diagnostics()) &&
                         readDiskImageBlobs("Sample.dmg", read.signature, said.diagnostics());
    EXPECT_EQ(isImage, !read.signature.fault);
    read.lines = said.lines();
    return read;
}

DiskImageBuilder stapledImage() {
    return DiskImageBuilder()
        .data(Data(1000))
        .superblob(DiskImageBuilder::signature().blob(kTicketSlotType, test::ticketBlob("ticket")));
}

TEST(DiskImageSignature, IsReadInThreeSteps) {
    const auto [signature, lines] = readSigned(stapledImage());
    EXPECT_EQ(signature.fault, std::nullopt);
    const BlobRecord* const blob = ticketBlobOf(signature.blobs);
    ASSERT_NE(blob, nullptr);
    EXPECT_EQ(base::toString(ticketIn(*blob)), "ticket");
    EXPECT_EQ(explainTicketPlace(signature), std::nullopt);
    ASSERT_EQ(lines.size(), 3U);
    EXPECT_TRUE(lines[0].starts_with("Codesign offset 0x3e8 length: "));
    EXPECT_TRUE(lines[1].starts_with("Stored Codesign length: "));
    EXPECT_TRUE(lines[2].starts_with("Total Length: "));
}

TEST(DiskImageSignature, StatesItsFirstFaultWithTheOffset) {
    const DiskImageBuilder image = stapledImage().version(3);
    const std::uint64_t trailer = image.build().size() - 512;
    const auto [signature, lines] = readSigned(image);
    EXPECT_EQ(signature.fault, (TicketFault{trailer + 4, "the trailer's version is not 4"}));
    EXPECT_EQ(explainTicketPlace(signature),
              (TicketPlaceFault{"the trailer's version is not 4", trailer + 4}));
    EXPECT_EQ(lines.size(), 1U);
}

TEST(DiskImageSignature, OfAnUnreadableTrailerSaysWhyAndThenFailsOnItsMagic) {
    const Data bytes = stapledImage().build();
    test::MemoryReader file(bytes, bytes.size() - 1);
    test::CollectedDiagnostics said;
    DiskImageSignature signature;
    EXPECT_FALSE(readDiskImageTrailer(file, "Sample.dmg", signature, said.diagnostics()));
    EXPECT_EQ(said.lines(),
              (std::vector<std::string>{
                  "Could read UDIF header of Sample.dmg. This should not have happened. a broken sector",
                  "Not a supported disk image format, 0"}));
    EXPECT_STREQ(signature.fault.value_or(TicketFault()).rule,
                 "the file does not end in a disk image's trailer");
}

}  // namespace
}  // namespace pinwell
