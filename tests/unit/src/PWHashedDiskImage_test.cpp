// Reading: trailer, superblob, ticket and cdhash.
#include "src/PWHashedFile/PWHashedDiskImage.h"

#include <filesystem>
#include <fstream>
#include <limits>

#include "base/byte_io.h"
#include "base/bytes.h"
#include "disk_image_fixture.h"
#include "formats/tm_ticket.h"
#include "runtime/process.h"
#include "src/cdhash_extract.h"
#include "support/resident_memory.h"
#include "values/value.h"

namespace pinwell {
namespace {

using base::ByteWriter;
using base::Data;
using test::DiskImageBuilder;
using test::Lines;
using test::makeBlob;
using test::MessageCapture;
using test::SuperBlobBuilder;

class DiskImage : public test::DiskImageTest {
  protected:
    // The lines printed while the image is read, which must end with exit code `code`.
    Lines linesOfReading(std::int32_t code) {
        const MessageCapture output(kVerbosityVerbose);
        EXPECT_EQ(open().appropriateExitCode(), code);
        return output.lines();
    }
    Lines linesOfReading(const DiskImageBuilder& builder, std::int32_t code) {
        put(builder);
        return linesOfReading(code);
    }
    static std::string codesignLine(std::uint64_t offset, std::uint64_t length) {
        return values::format("Codesign offset 0x%llx length: %llu", offset, length);
    }
};

TEST_F(DiskImage, IsMadeByTheFactoryForADmgFile) {
    put(DiskImageBuilder());
    const auto file = PWHashedFile::initWithFileURL(url, platform.services());
    EXPECT_NE(dynamic_cast<PWHashedDiskImage*>(file.get()), nullptr);
    EXPECT_EQ(file->appropriateExitCode(), 0);
    EXPECT_EQ(file->fileURL(), url);
}

TEST_F(DiskImage, SignedHasTheSuperblobAndItsBlobsInIndexOrder) {
    const Data superblob = DiskImageBuilder::signature().build();
    EXPECT_EQ(linesOfReading(DiskImageBuilder().superblob(superblob), 0),
              (Lines{codesignLine(1000, superblob.size()),
                     values::format("Stored Codesign length: %tu number of blobs: 3", superblob.size()),
                     values::format("Total Length: %tu Found blobs: 3", superblob.size())}));
    const auto image = open();
    EXPECT_EQ(image.superblob(), superblob);
    EXPECT_EQ(image.numBlobs(), 3U);
    ASSERT_EQ(image.blobs().size(), 3U);
    EXPECT_EQ(image.blobs()[0].slotType, 0U);
    EXPECT_EQ(image.blobs()[2].slotType, 0x10000U);
    EXPECT_EQ(image.origEOF(), 1000 + superblob.size() + 512);
    EXPECT_EQ(image.csStart(), 1000U);
    EXPECT_EQ(image.endOfDMGData(), 1000U);
    EXPECT_EQ(image.csLength(), superblob.size());
    EXPECT_EQ(image.syntheticCDHash(), std::nullopt);
    EXPECT_EQ(platform.codeSigning.createCalls, 0);
}

TEST_F(DiskImage, UnsignedHasTheEmptySuperblobAndASyntheticHash) {
    const Lines lines = linesOfReading(DiskImageBuilder(), 0);
    ASSERT_GE(lines.size(), 4U);
    EXPECT_EQ(lines[0],
              "Creating synthetic cdHash for unsigned disk image, image.dmg. Humanity must endure.");
    EXPECT_EQ(lines[1], "Signing information is {");
    EXPECT_EQ(lines[lines.size() - 2], "Stored Codesign length: 12 number of blobs: 0");
    EXPECT_EQ(lines.back(), "Total Length: 12 Found blobs: 0");

    const auto image = open();
    EXPECT_EQ(image.superblob(), emptySuperblob());
    EXPECT_TRUE(image.blobs().empty());
    EXPECT_EQ(image.numBlobs(), 0U);
    EXPECT_EQ(image.csStart(), 1000U);
    EXPECT_EQ(image.endOfDMGData(), 1000U);
    EXPECT_EQ(image.csLength(), 12U);
    EXPECT_EQ(image.syntheticCDHash(), syntheticHash());
    EXPECT_EQ(image.digestAlgorithm(), 2U);
    EXPECT_EQ(image.dmgHeader().codeSignOffset(), 0U);
    EXPECT_EQ(image.dmgHeader().codeSignLength(), 0U);
}

TEST_F(DiskImage, OfNothingButATrailerIsUnsigned) {
    put(DiskImageBuilder().data({}));
    const auto image = open();
    EXPECT_EQ(image.appropriateExitCode(), 0);
    EXPECT_EQ(image.origEOF(), 512U);
    EXPECT_EQ(image.csStart(), 0U);
    EXPECT_EQ(image.syntheticCDHash(), syntheticHash());
}

TEST_F(DiskImage, WithOnlyOneOfTheSignatureFieldsIsUnsigned) {
    put(DiskImageBuilder().codeSignOffset(77));
    EXPECT_EQ(open().syntheticCDHash(), syntheticHash());
    put(DiskImageBuilder().codeSignLength(77));
    EXPECT_EQ(open().syntheticCDHash(), syntheticHash());
    EXPECT_EQ(open().appropriateExitCode(), 0);
}

TEST_F(DiskImage, WithASuperblobThatCountsNoBlobsIsSignedAndAccepted) {
    put(DiskImageBuilder().superblob(emptySuperblob()));
    const auto image = open();
    EXPECT_EQ(image.appropriateExitCode(), 0);
    EXPECT_TRUE(image.blobs().empty());
    EXPECT_EQ(image.syntheticCDHash(), std::nullopt);
}

// Without a set of blobs the number is zero, which is the superblob's count.
TEST_F(DiskImage, WhoseSuperblobCountsNoBlobsButIsLongerIsAccepted) {
    const std::uint64_t length = 20;
    Data superblob = SuperBlobBuilder().length(length).build();
    superblob.resize(length);
    EXPECT_EQ(linesOfReading(DiskImageBuilder().superblob(superblob), 0),
              (Lines{codesignLine(1000, length), "Stored Codesign length: 20 number of blobs: 0",
                     "Length of all blobs (12) did not match length of code signing data (20)."}));
    EXPECT_TRUE(open().blobs().empty());
}

TEST_F(DiskImage, WhoseSuperblobIsMagicAndLengthAloneIsAccepted) {
    const Data superblob = ByteWriter().be32(0xFADE0CC0).be32(8).data();
    EXPECT_EQ(linesOfReading(DiskImageBuilder().superblob(superblob), 0),
              (Lines{codesignLine(1000, 8), "Stored Codesign length: 8 number of blobs: 0",
                     "Length of all blobs (12) did not match length of code signing data (8)."}));
}

TEST_F(DiskImage, ThatCannotBeOpenedEndsWith66) {
    platform.files.fail("openForReading", EACCES);
    const Lines lines = linesOfReading(DiskImageBuilder(), 66);
    ASSERT_EQ(lines.size(), 2U);
    EXPECT_EQ(lines[0].find("Could not create file handle to " + url.absoluteString() + ". Error Domain="),
              0U);
    EXPECT_EQ(lines[1].find("Could not get disk image header from image.dmg. Error Domain="), 0U);
}

TEST_F(DiskImage, ThatDoesNotTellItsSizeIsTooSmall) {
    platform.files.fail("handle.size", EIO);
    const Lines lines = linesOfReading(DiskImageBuilder(), 66);
    ASSERT_EQ(lines.size(), 2U);
    EXPECT_EQ(
        lines[0].find("Could not get file size of image.dmg. This should not have happened. Cannot size"),
        0U);
    EXPECT_EQ(lines[1], "image.dmg is too small (0 bytes) to be a proper disk image");
}

TEST_F(DiskImage, Of511BytesIsTooSmall) {
    Data bytes = DiskImageBuilder().data({}).build();
    bytes.pop_back();
    test::writeFile(path, base::ByteView(bytes));
    EXPECT_EQ(linesOfReading(66), Lines{"image.dmg is too small (511 bytes) to be a proper disk image"});
}

// The operations of reading, in order.
constexpr std::size_t kTrailerRead = 3;  // after stateOfItem, openForReading and size
constexpr std::size_t kSuperblobRead = 4;

TEST_F(DiskImage, WhoseTrailerCannotBeReadHasNoMagic) {
    platform.files.failOperation(kTrailerRead, EIO);
    const Lines lines = linesOfReading(DiskImageBuilder(), 66);
    ASSERT_EQ(lines.size(), 2U);
    EXPECT_EQ(
        lines[0].find("Could read UDIF header of image.dmg. This should not have happened. Cannot read "),
        0U);
    EXPECT_EQ(lines[1], "Not a supported disk image format, 0");
}

TEST_F(DiskImage, WhoseTrailerIsReadShortHasNoMagic) {
    platform.files.cutRead(kTrailerRead, 511);
    EXPECT_EQ(linesOfReading(DiskImageBuilder(), 66), Lines{"Not a supported disk image format, 0"});
}

TEST_F(DiskImage, WithAnotherMagicIsRefusedWithItsBytesAsALittleEndianNumber) {
    EXPECT_EQ(linesOfReading(DiskImageBuilder().magic("kolx"), 66),
              Lines{"Not a supported disk image format, 2020372331"});
    EXPECT_EQ(linesOfReading(DiskImageBuilder().magic("\xFF\xFF\xFF\xFF"), 66),
              Lines{"Not a supported disk image format, -1"});
}

TEST_F(DiskImage, OfVersion3IsRefused) {
    EXPECT_EQ(
        linesOfReading(DiskImageBuilder().version(3), 66),
        Lines{runtime::processName() + " only supports version 4 disk images while image.dmg is version 3."});
}

TEST_F(DiskImage, WhoseSignatureOverflowsIsRefusedInSilence) {
    constexpr std::uint64_t kHuge = std::numeric_limits<std::uint64_t>::max();
    EXPECT_EQ(linesOfReading(DiskImageBuilder().codeSignOffset(2).codeSignLength(kHuge - 1), 66),
              Lines{codesignLine(2, kHuge - 1)});
}

TEST_F(DiskImage, WhoseSignatureEndsAsFarAsNumbersGoIsRefusedAloud) {
    constexpr std::uint64_t kHuge = std::numeric_limits<std::uint64_t>::max();
    EXPECT_EQ(
        linesOfReading(DiskImageBuilder().codeSignOffset(2).codeSignLength(kHuge - 2), 66),
        (Lines{codesignLine(2, kHuge - 2),
               "In a good disk image, the stored code signature end MUST match the UDIF header start. It "
               "currently doesn't. (18446744073709551615 vs 1000)"}));
}

TEST_F(DiskImage, WhoseSignatureDoesNotEndAtTheTrailerIsRefused) {
    const Data superblob = emptySuperblob();
    for (const std::uint64_t length : {11U, 13U}) {
        EXPECT_EQ(linesOfReading(DiskImageBuilder().superblob(superblob).codeSignLength(length), 66),
                  (Lines{codesignLine(1000, length),
                         values::format("In a good disk image, the stored code signature end MUST match the "
                                        "UDIF header start. It currently doesn't. (%llu vs 1012)",
                                        1000 + length)}));
    }
    EXPECT_EQ(platform.files.count("handle.read"), 2U) << "only the trailers should have been read";
}

TEST_F(DiskImage, WhoseSuperblobCannotBeReadIsRefused) {
    platform.files.failOperation(kSuperblobRead, EIO);
    const Lines lines = linesOfReading(DiskImageBuilder().superblob(emptySuperblob()), 66);
    ASSERT_EQ(lines.size(), 2U);
    EXPECT_EQ(lines[1].find("Could read code signature header of image.dmg. This should not have happened. "
                            "Cannot read "),
              0U);
}

TEST_F(DiskImage, WhoseSuperblobIsReadShortIsRefusedInSilence) {
    platform.files.cutRead(kSuperblobRead, 11);
    EXPECT_EQ(linesOfReading(DiskImageBuilder().superblob(emptySuperblob()), 66),
              Lines{codesignLine(1000, 12)});
}

TEST_F(DiskImage, WithoutASyntheticHashIsRefusedWithTheStatus) {
    platform.codeSigning.addStatus = -36;
    const Lines lines = linesOfReading(DiskImageBuilder(), 66);
    ASSERT_EQ(lines.size(), 3U);
    EXPECT_EQ(lines[2], "synthetic cdHash generation failed. -36");
}

TEST_F(DiskImage, WhoseSigningGivesNoHashIsAcceptedWithoutOne) {
    platform.codeSigning.detachedInformation = codesign::SigningInformation{};
    put(DiskImageBuilder());
    auto image = open();
    EXPECT_EQ(image.appropriateExitCode(), 0);
    EXPECT_EQ(image.syntheticCDHash(), std::nullopt);
    EXPECT_EQ(image.digestAlgorithm(), 0U);
    EXPECT_EQ(image.cdHash(), std::nullopt);
}

TEST_F(DiskImage, WithAnotherSuperblobMagicIsRefusedWithItsBytesAsALittleEndianNumber) {
    EXPECT_EQ(linesOfReading(DiskImageBuilder().superblob(SuperBlobBuilder().magic(0xFADE0CC1)), 66),
              (Lines{codesignLine(1000, 12), "Not a supported code signature block, -1056121094"}));
}

TEST_F(DiskImage, WithMoreBlobsThanFitIsRefusedWithTheBoundFirstAndTheCountLast) {
    const auto builder = SuperBlobBuilder().blob(2, makeBlob(0xFADE0C01, Data(12))).count(3);
    EXPECT_EQ(linesOfReading(DiskImageBuilder().superblob(builder), 66),
              (Lines{codesignLine(1000, 40), "Stored Codesign length: 40 number of blobs: 3",
                     "2 blobs in image.dmg exceeds the maximum possible number of blobs, 3"}));
}

TEST_F(DiskImage, ShowsTheUppermostLengthsAndCountsAsTheMessagesHaveThem) {
    constexpr std::uint32_t kAll = 0xFFFFFFFF;
    EXPECT_EQ(linesOfReading(DiskImageBuilder().superblob(SuperBlobBuilder().count(kAll)), 66),
              (Lines{codesignLine(1000, 12), "Stored Codesign length: 12 number of blobs: -1",
                     "0 blobs in image.dmg exceeds the maximum possible number of blobs, -1"}));
    EXPECT_EQ(linesOfReading(DiskImageBuilder().superblob(SuperBlobBuilder().length(kAll)), 66),
              (Lines{codesignLine(1000, 12), "Stored Codesign length: 4294967295 number of blobs: 0",
                     "The code signature block must be 12 bytes in length. However, it is -1."}));
}

TEST_F(DiskImage, WhoseSuperblobStatesAnotherLengthIsRefused) {
    EXPECT_EQ(linesOfReading(DiskImageBuilder().superblob(SuperBlobBuilder().length(13)), 66),
              (Lines{codesignLine(1000, 12), "Stored Codesign length: 13 number of blobs: 0",
                     "The code signature block must be 12 bytes in length. However, it is 13."}));
}

TEST_F(DiskImage, WhoseSuperblobIsShorterThanAHeaderTakesTheRestForZero) {
    Data magicAlone = emptySuperblob();
    magicAlone.resize(4);
    EXPECT_EQ(linesOfReading(DiskImageBuilder().superblob(magicAlone), 66),
              (Lines{codesignLine(1000, 4), "Stored Codesign length: 0 number of blobs: 0",
                     "The code signature block must be 4 bytes in length. However, it is 0."}));
}

TEST_F(DiskImage, WithTwoEqualIndexEntriesIsRefused) {
    const Data blob = makeBlob(0xFADE0C01, Data(4));
    const auto builder = SuperBlobBuilder().blob(2, blob).blob(2, blob).offsetOf(2, 28);
    EXPECT_EQ(linesOfReading(DiskImageBuilder().superblob(builder), 66).back(),
              "Did not find 2 unique blobs in the code signing data.");
}

TEST_F(DiskImage, WhoseIndexIsOutOfFileOrderIsRefused) {
    const Lines lines =
        linesOfReading(DiskImageBuilder().superblob(DiskImageBuilder::signature().reverseIndex()), 66);
    ASSERT_EQ(lines.size(), 4U);
    EXPECT_EQ(lines[2].find("Calculated length ("), 0U);
    EXPECT_EQ(lines[3].find("Length of all blobs ("), 0U);
}

TEST_F(DiskImage, WhoseBlobsLeaveAGapIsRefused) {
    const auto builder = SuperBlobBuilder().gap(4).blob(2, makeBlob(0xFADE0C01, Data(4)));
    EXPECT_EQ(linesOfReading(DiskImageBuilder().superblob(builder), 66).back(),
              "Length of all blobs (32) did not match length of code signing data (36).");
}

TEST_F(DiskImage, WithAnIndexEntryThatLeadsNowhereIsRefused) {
    const auto builder = SuperBlobBuilder().blob(2, makeBlob(0xFADE0C01, Data(4))).offsetOf(2, 0xFFFFFFFF);
    EXPECT_EQ(linesOfReading(DiskImageBuilder().superblob(builder), 66).back(),
              "Length of all blobs (20) did not match length of code signing data (32).");
}

TEST_F(DiskImage, WhoseIndexExceedsTheSuperblobIsRefused) {
    Data cut = SuperBlobBuilder().count(1).length(16).build();
    cut.resize(16);
    EXPECT_EQ(linesOfReading(DiskImageBuilder().superblob(cut), 66).back(),
              "Did not find 1 unique blobs in the code signing data.");
}

TEST_F(DiskImage, WhoseLastBlobHasNoRoomForItsHeaderIsRefusedThoughAllIsFilled) {
    EXPECT_EQ(linesOfReading(DiskImageBuilder().superblob(SuperBlobBuilder().blob(2, {})), 66).back(),
              "Total Length: 20 Found blobs: 0");
}

// A file with a hole between its data and its trailer: it is as long as its trailer claims.
class SparseDiskImage : public DiskImage {
  protected:
    void putSparse(std::uint64_t signatureLength, const Data& startOfSignature = {}) {
        Data start(1000, std::byte{0xDA});
        base::append(start, startOfSignature);
        test::writeFile(path, base::ByteView(start));
        std::filesystem::resize_file(path, 1000 + signatureLength);
        const Data trailer =
            DiskImageBuilder().codeSignOffset(1000).codeSignLength(signatureLength).trailer();
        std::ofstream(path, std::ios::binary | std::ios::app) << base::toString(trailer);
        ASSERT_EQ(std::filesystem::file_size(path), 1000 + signatureLength + 512);
    }
};

TEST_F(SparseDiskImage, WithASuperblobBeyond32BitsIsRefusedByItsHeaderAlone) {
    constexpr std::uint64_t kLength = 1ULL << 36;
    putSparse(kLength, ByteWriter().be32(0xFADE0CC0).be32(0).be32(0).data());
    EXPECT_EQ(linesOfReading(66),
              (Lines{codesignLine(1000, kLength), "Stored Codesign length: 0 number of blobs: 0",
                     "The code signature block must be 68719476736 bytes in length. However, it is 0."}));
    EXPECT_EQ(platform.files.count("handle.read"), 2U);
}

// The tool and the code-signing service find the same signature in an image, whatever its length.
class LargeDiskImage : public SparseDiskImage {
  protected:
    std::optional<Data> hashOfTheSignature() {
        const auto basic = basicCodeProperties(url, platform.servicesWith(*service));
        const values::Value properties(basic);
        const Data* hash = properties["cdhash"].data();
        return hash == nullptr ? std::nullopt : std::optional(*hash);
    }
    static Data signersHash() { return test::codeHashOf(2, DiskImageBuilder::codeDirectory()); }

    std::unique_ptr<codesign::CodeSigningService> service = codesign::makeCodeSigningService();
};

// A ticket of zeros fills up the length.
TEST_F(LargeDiskImage, WithASuperblobOfFourGibibytesTakesMemoryForItsExistingBytes) {
    constexpr std::uint32_t kLength = 0xFFFFFFFF;
    const auto others = static_cast<std::uint32_t>(DiskImageBuilder::signature().build().size());
    const Data header = ByteWriter().be32(0xFADE0B01).be32(kLength - others - 8).data();
    putSparse(kLength, DiskImageBuilder::signature().blob(0x10002, header).length(kLength).build());
    const std::size_t before = test::residentMemory();
    const auto image = open();
    EXPECT_EQ(image.appropriateExitCode(), 0);
    ASSERT_EQ(image.blobs().size(), 4U);
    EXPECT_EQ(image.blobs().back().length(), kLength - others - 8);
    EXPECT_EQ(hashOfTheSignature(), signersHash());
    EXPECT_LE(test::residentMemory(), before + test::kLittleMemory);
}

// No ticket of this length is ever accepted: only enough of it is kept to show this.
TEST_F(LargeDiskImage, HasTheBeginningOfATicketThatIsLongerThanAny) {
    constexpr std::uint32_t kLength = 200U * 1024 * 1024;
    const Data header = ByteWriter().be32(0xFADE0B01).be32(kLength - 20).data();
    putSparse(kLength, SuperBlobBuilder().blob(0x10002, header).length(kLength).build());
    EXPECT_EQ(open()._ticketData()->size(), kLongestTicketHeld);
}

TEST_F(LargeDiskImage, WithMoreBlobsThan16BitsCountIsRead) {
    constexpr std::uint32_t kBlobs = 70'000;
    SuperBlobBuilder builder = DiskImageBuilder::signature();
    for (std::uint32_t i = 3; i < kBlobs; ++i) builder.blob(0x20000 + i, makeBlob(0xFADE7171, {}));
    put(DiskImageBuilder().superblob(builder));
    const auto image = open();
    EXPECT_EQ(image.appropriateExitCode(), 0);
    EXPECT_EQ(image.blobs().size(), kBlobs);
    EXPECT_EQ(hashOfTheSignature(), signersHash());
}

TEST_F(DiskImage, IsNeverReadInFrontOfItsSignature) {
    put(DiskImageBuilder().superblob(DiskImageBuilder::signature()));
    open();
    EXPECT_EQ(platform.files.names(),
              (Lines{"stateOfItem", "openForReading", "handle.size", "handle.read", "handle.read"}));
}

TEST_F(DiskImage, ReturnsItsTicketWithoutTheBlobsHeader) {
    put(DiskImageBuilder().superblob(
        DiskImageBuilder::signature().blob(0x10002, test::ticketBlob("TICKET"))));
    EXPECT_EQ(open().ticketData(), base::toData("TICKET"));
}

TEST_F(DiskImage, WithoutATicketReturnsNone) {
    put(DiskImageBuilder().superblob(DiskImageBuilder::signature()));
    EXPECT_EQ(open().ticketData(), std::nullopt);
    put(DiskImageBuilder());
    EXPECT_EQ(open().ticketData(), std::nullopt);
}

TEST_F(DiskImage, WithTwoTicketsReturnsTheLaterOne) {
    put(DiskImageBuilder().superblob(SuperBlobBuilder()
                                         .blob(0x10002, test::ticketBlob("FIRST"))
                                         .blob(0x10002, test::ticketBlob("SECOND"))));
    EXPECT_EQ(open().ticketData(), base::toData("SECOND"));
}

TEST_F(DiskImage, KnowsItsTicketByTheSlotWhateverTheMagicIs) {
    put(DiskImageBuilder().superblob(
        SuperBlobBuilder().blob(0x10002, makeBlob(0x12345678, base::asBytes("TICKET")))));
    EXPECT_EQ(open().ticketData(), base::toData("TICKET"));
}

TEST_F(DiskImage, HasNoTicketInABlobThatIsShorterThanItsHeader) {
    // Two index entries overlap, so the first blob is 4 bytes long and has this length.
    const Data words = ByteWriter().be32(0xFADE0B01).be32(4).be32(8).data();
    put(DiskImageBuilder().superblob(SuperBlobBuilder().blob(0x10002, words).blob(5, {}).offsetOf(5, 32)));
    auto image = open();
    ASSERT_EQ(image.appropriateExitCode(), 0);
    EXPECT_EQ(image.blobs().size(), 2U);
    EXPECT_EQ(image.ticketData(), std::nullopt);
}

TEST_F(DiskImage, SignedTakesHashAndAlgorithmFromItsCodeSignature) {
    platform.codeSigning.validity = codesign::kSuccess;
    platform.codeSigning.information.emplace();
    platform.codeSigning.information->unique = Data(48, std::byte{0xAB});
    platform.codeSigning.information->digestAlgorithm = 4;
    put(DiskImageBuilder().superblob(DiskImageBuilder::signature()));
    auto image = open();
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(image.cdHash(), Data(48, std::byte{0xAB}));
    EXPECT_EQ(image.digestAlgorithm(), 4U);
    EXPECT_EQ(output.lines().front(), "Props are {");
}

TEST_F(DiskImage, WhoseSignatureNamesNoAlgorithmHasNumber0) {
    platform.codeSigning.validity = codesign::kSuccess;
    platform.codeSigning.information.emplace();
    platform.codeSigning.information->unique = Data(20, std::byte{0xAB});
    put(DiskImageBuilder().superblob(DiskImageBuilder::signature()));
    auto image = open();
    image.setDigestAlgorithm(7);
    EXPECT_EQ(image.cdHash(), Data(20, std::byte{0xAB}));
    EXPECT_EQ(image.digestAlgorithm(), 0U);
}

TEST_F(DiskImage, UnsignedReturnsTheHashMadeWhileReading) {
    put(DiskImageBuilder());
    auto image = open();
    platform.codeSigning.addStatus = -36;
    EXPECT_EQ(image.cdHash(), syntheticHash());
    EXPECT_EQ(image.digestAlgorithm(), 2U);
}

TEST_F(DiskImage, WithOnlyATicketMakesItsHashOnRequest) {
    put(DiskImageBuilder().superblob(SuperBlobBuilder().blob(0x10002, test::ticketBlob("TICKET"))));
    auto image = open();
    EXPECT_EQ(image.digestAlgorithm(), 0U);
    EXPECT_EQ(image.cdHash(), syntheticHash());
    EXPECT_EQ(image.digestAlgorithm(), 2U);
    EXPECT_EQ(image.syntheticCDHash(), std::nullopt);
}

TEST_F(DiskImage, WithAnInvalidSignatureHasTheHashThatIsMadeUp) {
    platform.codeSigning.validity = codesign::kInvalidSignature;
    platform.codeSigning.information.emplace();
    platform.codeSigning.information->unique = Data(48, std::byte{0xAB});
    platform.codeSigning.information->digestAlgorithm = 4;
    put(DiskImageBuilder().superblob(DiskImageBuilder::signature()));
    auto image = open();
    EXPECT_EQ(image.cdHash(), syntheticHash());
    EXPECT_EQ(image.digestAlgorithm(), 2U);
}

TEST_F(DiskImage, WhoseHashCannotBeMadeOnRequestHasNone) {
    put(DiskImageBuilder().superblob(SuperBlobBuilder().blob(0x10002, test::ticketBlob("TICKET"))));
    auto image = open();
    platform.codeSigning.addStatus = -36;
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(image.cdHash(), std::nullopt);
    EXPECT_EQ(output.lines().back(), "Generating a synthetic cdHash for image.dmg failed. -36");
    EXPECT_EQ(image.appropriateExitCode(), 0);
}

}  // namespace
}  // namespace pinwell
