// The hash of a package.
#include <gmock/gmock.h>

#include <filesystem>

#include "base/bytes.h"
#include "package_fixture.h"
#include "src/DownloadDelegate.h"
#include "support/archive_builder.h"

namespace pinwell {
namespace {

using base::Data;
using test::ArchiveBuilder;
using test::MessageCapture;
using test::PackageBuilder;
using testing::ElementsAre;
using testing::StartsWith;

class FlatPackageHash : public test::FlatPackageTest {
  protected:
    void put(const ArchiveBuilder& archive) { test::writeFile(path, archive.build()); }
};

TEST_F(FlatPackageHash, IsTheChecksumThatTheSignatureSigns) {
    const ArchiveBuilder archive = ArchiveBuilder().signature("CMS");
    put(archive);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.cdHash(), archive.rightChecksum());
    EXPECT_EQ(package.cdHash()->size(), 20U);
    EXPECT_EQ(package.digestAlgorithm(), 1U);
    EXPECT_EQ(package.appropriateExitCode(), 0);
    EXPECT_THAT(output.lines(),
                ElementsAre("Sig Type is CMS. Length is 3", "Package Sample.pkg uses a checksum of size 20"));
}

TEST_F(FlatPackageHash, OfA32ByteChecksumIsKeptWholeWithAlgorithm2) {
    const ArchiveBuilder archive = ArchiveBuilder().digest("sha256").signature("CMS");
    put(archive);
    EXPECT_EQ(package.cdHash(), archive.rightChecksum());
    EXPECT_EQ(package.cdHash()->size(), 32U);
    EXPECT_EQ(package.digestAlgorithm(), 2U);
}

// Entries are compared at the size of their algorithm, 20 or 48 bytes, and the hash is not cut to match.
TEST_F(FlatPackageHash, Of32BytesMatchesNoEntryOfAnyAlgorithmSoItsTicketIsRefusedWith65) {
    const ArchiveBuilder archive = ArchiveBuilder().digest("sha256").signature("CMS");
    put(archive);
    for (const std::size_t length : {std::size_t{20}, std::size_t{48}}) {
        for (unsigned algorithm = 0; algorithm <= 4; ++algorithm) {
            Data listed = archive.rightChecksum();
            listed.resize(length);
            Data ticket = test::unsignedTicket({listed});
            ticket[ticket.size() - 72 - length - 1] = static_cast<std::byte>(algorithm);
            const auto file = std::make_shared<PWHashedFlatPackage>(url, platform.services());
            DownloadDelegate controller(file, platform.services());
            EXPECT_FALSE(controller.isValidTicketData(ticket)) << length << " " << algorithm;
            EXPECT_EQ(file->appropriateExitCode(), 65) << length << " " << algorithm;
        }
    }
}

TEST_F(FlatPackageHash, Of20BytesMatchesTheTicketThatListsIt) {
    const ArchiveBuilder archive = ArchiveBuilder().signature("CMS");
    put(archive);
    const auto file = std::make_shared<PWHashedFlatPackage>(url, platform.services());
    DownloadDelegate controller(file, platform.services());
    EXPECT_TRUE(controller.isValidTicketData(test::unsignedTicket({archive.rightChecksum()})));
}

TEST_F(FlatPackageHash, OfA48ByteChecksumHasAlgorithm0) {
    const ArchiveBuilder archive = ArchiveBuilder().namedDigest("sha384").signature("CMS");
    put(archive);
    EXPECT_EQ(package.cdHash(), archive.rightChecksum());
    EXPECT_EQ(package.cdHash()->size(), 48U);
    EXPECT_EQ(package.digestAlgorithm(), 0U);
}

TEST_F(FlatPackageHash, TheChecksumsSizeIsReadFromItsLeadingDigits) {
    for (const char* size : {"20", " 20 ", "020", "20xyz"}) {
        put(ArchiveBuilder().checksumSize(size).signature("CMS"));
        PWHashedFlatPackage file{url, platform.services()};
        const MessageCapture output(kVerbosityVerbose);
        EXPECT_TRUE(file.cdHash().has_value()) << size;
        EXPECT_EQ(file.digestAlgorithm(), 1U) << size;
        EXPECT_EQ(output.lines().back(), std::string("Package Sample.pkg uses a checksum of size ") + size);
    }
}

TEST_F(FlatPackageHash, WithAnMD5ChecksumHasAlgorithm0) {
    put(ArchiveBuilder().digest("md5").signature("CMS"));
    EXPECT_EQ(package.cdHash()->size(), 16U);
    EXPECT_EQ(package.digestAlgorithm(), 0U);
}

TEST_F(FlatPackageHash, OfTwoSignaturesTheOneOfTypeCMSIsTakenAndBothAreLogged) {
    const ArchiveBuilder archive = ArchiveBuilder().signature("RSA").signature("CMS");
    put(archive);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.cdHash(), archive.rightChecksum());
    EXPECT_THAT(output.lines(), ElementsAre("Sig Type is RSA. Length is 3", "Sig Type is CMS. Length is 3",
                                            "Package Sample.pkg uses a checksum of size 20"));
}

TEST_F(FlatPackageHash, SignaturesAfterTheUsedOneAreNotRead) {
    put(ArchiveBuilder().signature("CMS").signature("RSA"));
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_TRUE(package.cdHash().has_value());
    EXPECT_FALSE(output.contains("Sig Type is RSA. Length is 3"));
}

TEST_F(FlatPackageHash, TheTypeIsComparedExactly) {
    put(ArchiveBuilder().signature("cms").signature("CMS ").signature("CMSX"));
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.cdHash(), std::nullopt);
    EXPECT_EQ(output.lines().back(),
              "Could not find an appropriate \"code signature\" in the Sample.pkg installer package.");
}

TEST_F(FlatPackageHash, OfAnUnsignedArchiveIsNone) {
    put(ArchiveBuilder());
    package.setDigestAlgorithm(7);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.cdHash(), std::nullopt);
    EXPECT_EQ(output.text(),
              "Could not find an appropriate \"code signature\" in the Sample.pkg installer package.\n");
    EXPECT_EQ(package.digestAlgorithm(), 7U) << "set only when a hash is returned";
    EXPECT_EQ(package.appropriateExitCode(), 0);
}

TEST_F(FlatPackageHash, ASignatureWithoutATypeIsSkipped) {
    put(ArchiveBuilder().element("<signature><size>1</size></signature>").signature("CMS"));
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_TRUE(package.cdHash().has_value());
    EXPECT_EQ(output.lines().front(), "Sig Type is (null). Length is 0");
}

TEST_F(FlatPackageHash, ATypeThatCouldDriveTheTerminalIsPrintedEscaped) {
    put(ArchiveBuilder().signature("&#xD;&#x9B;x"));
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.cdHash(), std::nullopt);
    EXPECT_EQ(output.text().find('\r'), std::string::npos);
    EXPECT_EQ(output.text().find("\xC2\x9B"), std::string::npos);
    EXPECT_NE(output.lines().front().find("Length is 4"), std::string::npos);
}

TEST_F(FlatPackageHash, OfAFileThatIsNoArchiveIsNoneWithoutAMessage) {
    for (const std::string& contents : {std::string(), std::string("no archive"), std::string(4096, '\0')}) {
        test::writeFile(path, contents);
        PWHashedFlatPackage file{url, platform.services()};
        const MessageCapture output(kVerbosityVerbose);
        EXPECT_EQ(file.cdHash(), std::nullopt);
        EXPECT_EQ(output.text(), "");
    }
}

TEST_F(FlatPackageHash, OfAMissingFileIsNoneInSilence) {
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.cdHash(), std::nullopt);
    EXPECT_EQ(output.text(), "");
}

// It would sign any twenty bytes of the heap.
TEST_F(FlatPackageHash, OfASignedArchiveWithoutAChecksumAlgorithmIsNoneWithoutAMessage) {
    put(ArchiveBuilder()
            .digest("none")
            .checksumElement(R"(<checksum style="none"><offset>0</offset><size>20</size></checksum>)")
            .signature("CMS"));
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(package.cdHash(), std::nullopt);
    EXPECT_EQ(output.text(), "");
}

TEST_F(FlatPackageHash, IsTheSameWhateverTrailersThePackageHas) {
    const PackageBuilder plain;
    test::writeFile(path, plain.build());
    const auto before = package.cdHash();
    ASSERT_TRUE(before.has_value());
    test::writeFile(path, PackageBuilder().terminator().unknown("one").ticket("TICKET").build());
    PWHashedFlatPackage stapled{url, platform.services()};
    EXPECT_EQ(stapled.cdHash(), before);
}

TEST_F(FlatPackageHash, ClosesTheArchiveOnEveryPath) {
    const auto openFiles = [] {
        return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
    };
    const auto before = openFiles();
    for (const ArchiveBuilder& archive :
         {ArchiveBuilder().signature("CMS"), ArchiveBuilder(),
          ArchiveBuilder()
              .digest("none")
              .checksumElement(R"(<checksum style="none"><offset>9999</offset><size>1</size></checksum>)")
              .signature("CMS")}) {
        put(archive);
        PWHashedFlatPackage file{url, platform.services()};
        file.cdHash();
    }
    EXPECT_EQ(openFiles(), before);
}

}  // namespace
}  // namespace pinwell
