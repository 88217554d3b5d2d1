// The checksum of the table of contents: its place in the heap according to the table, and the comparison.
#include "fixture.h"

namespace pinwell::test {
namespace {

using ArchiveChecksum = ArchiveTest;

TEST_F(ArchiveChecksum, ThatIsWrongIsRefused) {
    EXPECT_FALSE(opens(ArchiveBuilder().checksum(Data(20))));
    EXPECT_FALSE(opens(ArchiveBuilder().signature("CMS").checksum(Data(20))));
}

TEST_F(ArchiveChecksum, MayBeAnywhereInTheHeap) {
    const ArchiveBuilder builder =
        ArchiveBuilder().beforeChecksum(Data(300, std::byte{0xEE})).signature("CMS");
    const auto archive = open(builder);
    ASSERT_NE(archive, nullptr);
    EXPECT_EQ(property(archive, "checksum/offset"), (Property{0, "300"}));
    EXPECT_EQ(signedData(archive), builder.rightChecksum());
}

TEST_F(ArchiveChecksum, IsReadOnlyAtThePlaceInTheTable) {
    EXPECT_FALSE(opens(ArchiveBuilder().checksumOffset("1")));
    EXPECT_FALSE(opens(ArchiveBuilder().beforeChecksum(Data(20)).checksumOffset("0")));
}

TEST_F(ArchiveChecksum, MayBeTheFilesLastBytesAndNoFurtherOn) {
    EXPECT_TRUE(opens(ArchiveBuilder().afterChecksum({})));
    EXPECT_FALSE(opens(ArchiveBuilder().afterChecksum({}).checksumOffset("1")));
}

TEST_F(ArchiveChecksum, AfterTheEndOfTheFileIsRefused) {
    for (const char* offset :
         {"1000000", "9223372036854775807", "18446744073709551615", "18446744073709551596"})
        EXPECT_FALSE(opens(ArchiveBuilder().checksumOffset(offset))) << offset;
}

TEST_F(ArchiveChecksum, AnOffsetThatIsNoNumberOrTooLargeForOneIsRefused) {
    for (const char* offset : {"18446744073709551616", "99999999999999999999999", "-0", "-1", "x", "0x0"}) {
        const bool isZero = std::string(offset) == "0x0";  // its leading digits are
        EXPECT_EQ(opens(ArchiveBuilder().checksumOffset(offset)), isZero) << offset;
    }
}

TEST_F(ArchiveChecksum, NumbersAreReadFromTheirLeadingDigits) {
    for (const char* size : {"20", " 20 ", "\n20", "020", "20xyz", "+20", "00000000000000000000000000020"})
        EXPECT_TRUE(opens(ArchiveBuilder().checksumSize(size))) << size;
    EXPECT_TRUE(opens(ArchiveBuilder().checksumOffset(" 0junk")));
}

TEST_F(ArchiveChecksum, ASizeOtherThanTheDigestsIsRefused) {
    for (const char* size : {"0", "19", "21", "32", "-20", "2 0", "x20", "18446744073709551636"})
        EXPECT_FALSE(opens(ArchiveBuilder().checksumSize(size))) << size;
}

TEST_F(ArchiveChecksum, AStyleOtherThanTheHeadersAlgorithmIsRefused) {
    EXPECT_FALSE(opens(ArchiveBuilder().checksumStyle("sha256")));
    EXPECT_FALSE(opens(ArchiveBuilder().checksumStyle("none")));
    EXPECT_FALSE(opens(ArchiveBuilder().checksumStyle("sha1 ")));
    EXPECT_FALSE(opens(ArchiveBuilder().checksumStyle("")));
    for (const char* style : {"SHA1", "Sha1", "sha-1", "sha", "sha1\xC2\xA0"})
        EXPECT_FALSE(opens(ArchiveBuilder().checksumStyle(style))) << style;
    EXPECT_TRUE(opens(ArchiveBuilder().checksumStyle("sha1")));
    EXPECT_FALSE(opens(ArchiveBuilder().digest("sha256").checksumStyle("SHA256")));
}

TEST_F(ArchiveChecksum, AStyleOfAnotherNameSpaceIsNone) {
    const std::string inside = "<offset>0</offset><size>20</size></checksum>";
    EXPECT_FALSE(opens(ArchiveBuilder().checksumElement("<checksum x:style='sha1'>" + inside)));
    EXPECT_FALSE(opens(ArchiveBuilder().checksumElement("<checksum Style='sha1'>" + inside)));
    EXPECT_FALSE(opens(ArchiveBuilder().checksumElement("<checksum x:style='sha1' style='md5'>" + inside)));
    EXPECT_TRUE(opens(ArchiveBuilder().checksumElement("<checksum x:style='md5' style='sha1'>" + inside)));
    EXPECT_FALSE(opens(ArchiveBuilder().checksumElement("<checksum style='sha1' style='sha1'>" + inside)));
}

TEST_F(ArchiveChecksum, AHeaderWithoutAnAlgorithmDoesNotDisableIt) {
    EXPECT_FALSE(opens(ArchiveBuilder().algorithm(0)));
    EXPECT_FALSE(opens(ArchiveBuilder().algorithm(0).signature("CMS")));
}

TEST_F(ArchiveChecksum, OfAnUnsignedArchiveIsAtTheStartOfTheHeapByDefault) {
    EXPECT_TRUE(opens(ArchiveBuilder().checksumElement("<checksum style='sha1'/>")));
    EXPECT_TRUE(opens(ArchiveBuilder().checksumElement("<checksum style='sha1'><size>20</size></checksum>")));
    EXPECT_TRUE(
        opens(ArchiveBuilder().checksumElement("<checksum style='sha1'><offset>0</offset></checksum>")));
    EXPECT_FALSE(opens(ArchiveBuilder().checksumElement("<checksum style='sha1'/>").checksum(Data(20))));
}

TEST_F(ArchiveChecksum, OfASignedArchiveNeedsOffsetAndSize) {
    EXPECT_FALSE(opens(ArchiveBuilder().signature("CMS").checksumElement(
        "<checksum style='sha1'><size>20</size></checksum>")));
    EXPECT_FALSE(opens(ArchiveBuilder().signature("CMS").checksumElement(
        "<checksum style='sha1'><offset>0</offset></checksum>")));
}

TEST_F(ArchiveChecksum, OfASignedArchiveNeedsAnAlgorithm) {
    for (const char* name : {"signature", "x-signature", "s:signature"})
        for (const char* style : {"CMS", "RSA", ""}) {
            const std::string element = "<" + std::string(name) + " style='" + style + "'/>";
            EXPECT_FALSE(opens(ArchiveBuilder().digest("none").element(element))) << element;
            EXPECT_FALSE(opens(
                ArchiveBuilder()
                    .digest("none")
                    .checksumElement("<checksum style='none'><offset>2</offset><size>20</size></checksum>")
                    .element(element)))
                << element;
            EXPECT_FALSE(opens(ArchiveBuilder().algorithm(0).element(element))) << element;
            EXPECT_TRUE(opens(ArchiveBuilder().element(element))) << element;
        }
    EXPECT_TRUE(opens(ArchiveBuilder().digest("none"))) << "without a signature nothing is signed";
}

TEST_F(ArchiveChecksum, WithoutAnElementIsRefusedUnlessThereIsNoAlgorithm) {
    EXPECT_FALSE(opens(ArchiveBuilder().checksumElement("")));
    EXPECT_TRUE(opens(ArchiveBuilder().digest("none").checksumElement("")));
}

TEST_F(ArchiveChecksum, WithAnEmptyOffsetOrSizeIsRefused) {
    EXPECT_FALSE(opens(ArchiveBuilder().checksumElement("<checksum style='sha1'><offset/></checksum>")));
    EXPECT_FALSE(opens(ArchiveBuilder().checksumElement("<checksum style='sha1'><size> </size></checksum>")));
}

TEST_F(ArchiveChecksum, InTwoElementsIsRefusedAndSoAreTwoOffsetsOrSizes) {
    const std::string whole = "<checksum style='sha1'><offset>0</offset><size>20</size></checksum>";
    EXPECT_TRUE(opens(ArchiveBuilder().checksumElement(whole)));
    EXPECT_FALSE(opens(ArchiveBuilder().checksumElement(whole + whole)));
    EXPECT_FALSE(opens(ArchiveBuilder().checksumElement(
        "<checksum style='sha1'><offset>0</offset><offset>0</offset><size>20</size></checksum>")));
    EXPECT_FALSE(opens(ArchiveBuilder().checksumElement(
        "<checksum style='sha1'><offset>0</offset><size>20</size><size>20</size></checksum>")));
}

TEST_F(ArchiveChecksum, InTwoElementsIsRefusedHoweverTheSecondOneIsHidden) {
    const std::string inside = "<offset>0</offset><size>20</size>";
    const std::string whole = "<checksum style='sha1'>" + inside + "</checksum>";
    for (const std::string& other : {"<x:checksum style='sha1'>" + inside + "</x:checksum>",
                                     "<checksum xmlns='urn:x' style='sha1'>" + inside + "</checksum>",
                                     std::string("<checksum/>"), std::string("<checksum style='md5'/>")}) {
        EXPECT_FALSE(opens(ArchiveBuilder().checksumElement(whole + other))) << other;
        EXPECT_FALSE(opens(ArchiveBuilder().checksumElement(other + whole))) << other;
    }
    for (const char* second : {"<x:size>20</x:size>", "<size/>", "<x:offset>0</x:offset>", "<offset/>"})
        EXPECT_FALSE(opens(
            ArchiveBuilder().checksumElement("<checksum style='sha1'>" + inside + second + "</checksum>")))
            << second;
    // Text that only looks like a checksum.
    for (const char* none : {"<!--<checksum/>-->", "<?x <checksum/>?>", "<a><![CDATA[<checksum/>]]></a>",
                             "<a>&lt;checksum/&gt;</a>", "<Checksum/>", "<a><checksum/></a>"})
        EXPECT_TRUE(opens(ArchiveBuilder().checksumElement(whole + none))) << none;
}

TEST_F(ArchiveChecksum, IsTheSignedDataEvenIfTheFileChangesAfterwards) {
    const ArchiveBuilder builder = ArchiveBuilder().signature("CMS");
    const auto archive = open(builder);
    ASSERT_NE(archive, nullptr);
    Data changed = builder.build();
    changed.at(builder.heapStart()) ^= std::byte{1};
    writeFile(path, changed);
    EXPECT_EQ(signedData(archive), builder.rightChecksum());
}

TEST_F(ArchiveChecksum, InsideAFileOrASignatureIsNotTheTables) {
    const std::string other = "<checksum style='md5'><offset>1</offset><size>16</size></checksum>";
    EXPECT_TRUE(opens(ArchiveBuilder().element("<file>" + other + "</file>")));
    EXPECT_TRUE(opens(ArchiveBuilder().element("<signature>" + other + "</signature>")));
}

}  // namespace
}  // namespace pinwell::test
