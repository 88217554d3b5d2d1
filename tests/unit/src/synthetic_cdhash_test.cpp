#include "src/PWHashedFile/PWHashedDiskImage.h"

#include <gtest/gtest.h>

#include "base/bytes.h"
#include "src/messages.h"
#include "support/disk_image_builder.h"
#include "support/message_capture.h"
#include "support/test_platform.h"
#include "values/url.h"

namespace pinwell {
namespace {

using base::Data;
using codesign::kSuccess;
using test::DiskImageBuilder;
using test::MessageCapture;
using Lines = std::vector<std::string>;

class SyntheticCDHash : public testing::Test {
  protected:
    SyntheticCDHash() {
        test::writeFile(platform.directory / "image.dmg", base::ByteView(DiskImageBuilder().build()));
        platform.codeSigning.detachedInformation.emplace();
        platform.codeSigning.detachedInformation->cdHashes = {Data(20, std::byte{0xCD}), Data(20)};
        platform.codeSigning.detachedInformation->digestAlgorithms = {2, 1};
    }

    codesign::Status ask() {
        const MessageCapture output(kVerbosityVerbose);
        const auto status = syntheticCDHashForURL(platform.directory.url("image.dmg"), platform.services(),
                                                  &algorithm, &hash);
        lines = output.lines();
        return status;
    }

    void expectNothingStored() const {
        EXPECT_EQ(algorithm, kBefore);
        EXPECT_EQ(hash, Data{std::byte{7}});
    }

    static constexpr std::uint32_t kBefore = 7;

    test::TestPlatform platform;
    std::uint32_t algorithm = kBefore;
    std::optional<Data> hash = Data{std::byte{7}};
    Lines lines;
};

TEST_F(SyntheticCDHash, IsTheFirstOfTheDetachedSignature) {
    EXPECT_EQ(ask(), kSuccess);
    EXPECT_EQ(algorithm, 2U);
    EXPECT_EQ(hash, Data(20, std::byte{0xCD}));
    ASSERT_FALSE(lines.empty());
    EXPECT_EQ(lines.front(), "Signing information is {");
}

TEST_F(SyntheticCDHash, ComesFromAnAdHocSHA256SignatureOfOpaqueData) {
    ask();
    EXPECT_EQ(platform.codeSigning.signerFlags, 8U);
    EXPECT_EQ(platform.codeSigning.signerParameters->identifier, "ADHOC");
    EXPECT_EQ(platform.codeSigning.signerParameters->digestAlgorithm, codesign::DigestType::sha256);
    EXPECT_EQ(platform.codeSigning.informationSets, 2U);
}

TEST_F(SyntheticCDHash, WithoutAnyPlaceForAResultIsAParameterErrorThatChangesNothing) {
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(
        syntheticCDHashForURL(platform.directory.url("image.dmg"), platform.services(), nullptr, nullptr),
        -50);
    EXPECT_EQ(output.text(), "");
    EXPECT_EQ(platform.codeSigning.createCalls, 0);
    EXPECT_TRUE(platform.files.operations().empty());
}

TEST_F(SyntheticCDHash, CanBeRequestedWithoutItsAlgorithmAndViceVersa) {
    const values::URL image = platform.directory.url("image.dmg");
    EXPECT_EQ(syntheticCDHashForURL(image, platform.services(), nullptr, &hash), kSuccess);
    EXPECT_EQ(hash, Data(20, std::byte{0xCD}));
    EXPECT_EQ(syntheticCDHashForURL(image, platform.services(), &algorithm, nullptr), kSuccess);
    EXPECT_EQ(algorithm, 2U);
}

TEST_F(SyntheticCDHash, WithoutCodeFailsWithTheServicesStatus) {
    platform.codeSigning.createStatus = -67070;
    EXPECT_EQ(ask(), -67070);
    expectNothingStored();
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_EQ(lines[0].find("Unable to create for image.dmg: Error Domain=OSStatusErrorDomain Code=-67070 "),
              0U);
}

TEST_F(SyntheticCDHash, WithoutCodeInSpiteOfSuccessIsNoFailure) {
    platform.codeSigning.handsOutCode = false;
    EXPECT_EQ(ask(), 0);
    expectNothingStored();
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_EQ(lines[0].find("Unable to create for image.dmg: Error Domain=OSStatusErrorDomain Code=0 "), 0U);
}

TEST_F(SyntheticCDHash, WithoutASignerFailsWithTheServicesStatus) {
    platform.codeSigning.signerStatus = -67072;
    EXPECT_EQ(ask(), -67072);
    expectNothingStored();
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_EQ(
        lines[0].find("Unable to create signer reference. Error Domain=OSStatusErrorDomain Code=-67072 "),
        0U);
}

TEST_F(SyntheticCDHash, WhenSigningFailsFailsWithTheServicesStatus) {
    platform.codeSigning.addStatus = -36;
    EXPECT_EQ(ask(), -36);
    expectNothingStored();
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_EQ(
        lines[0].find("Unable to add signer to code reference. Error Domain=OSStatusErrorDomain Code=-36 "),
        0U);
}

TEST_F(SyntheticCDHash, WhenTheSignatureIsNotTakenFailsWithTheServicesStatus) {
    platform.codeSigning.detachedStatus = -67061;
    EXPECT_EQ(ask(), -67061);
    expectNothingStored();
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_EQ(lines[0].find("Unable to add detached signature to code reference. Error Domain="), 0U);
}

TEST_F(SyntheticCDHash, WithoutSigningInformationFailsWithTheServicesStatus) {
    platform.codeSigning.informationStatus = -67061;
    EXPECT_EQ(ask(), -67061);
    expectNothingStored();
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_EQ(
        lines[0].find("Could not get signing information. Error Domain=OSStatusErrorDomain Code=-67061 "),
        0U);
}

TEST_F(SyntheticCDHash, WithoutADictionaryInSpiteOfSuccessIsNoFailure) {
    platform.codeSigning.detachedInformation.reset();
    EXPECT_EQ(ask(), 0);
    expectNothingStored();
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_EQ(lines[0].find("Could not get signing information. Error Domain=OSStatusErrorDomain Code=0 "),
              0U);
}

TEST_F(SyntheticCDHash, ThatTheSignatureHasNotIsNoFailure) {
    platform.codeSigning.detachedInformation->digestAlgorithms.clear();
    platform.codeSigning.detachedInformation->cdHashes.clear();
    EXPECT_EQ(ask(), 0);
    expectNothingStored();
    EXPECT_EQ(lines, Lines{"Could not get newly minted CD hash for image.dmg."});
}

TEST_F(SyntheticCDHash, IsNotTakenFromListsOfDifferentLengths) {
    platform.codeSigning.detachedInformation->cdHashes.pop_back();
    EXPECT_EQ(ask(), 0);
    expectNothingStored();
    EXPECT_EQ(lines, Lines{"Could not get newly minted CD hash for image.dmg."});
}

class RealSyntheticCDHash : public SyntheticCDHash {
  protected:
    std::optional<Data> hashOf(std::string_view name) {
        const Platform real = platform.servicesWith(*service);
        std::optional<Data> found;
        EXPECT_EQ(syntheticCDHashForURL(platform.directory.url(name), real, &algorithm, &found), kSuccess);
        return found;
    }

    std::unique_ptr<codesign::CodeSigningService> service = codesign::makeCodeSigningService();
};

TEST_F(RealSyntheticCDHash, IsTheSameEachTimeAndLeavesTheFileAlone) {
    const auto first = hashOf("image.dmg");
    ASSERT_TRUE(first.has_value());
    EXPECT_EQ(first->size(), 20U);
    EXPECT_EQ(algorithm, 2U);
    EXPECT_EQ(hashOf("image.dmg"), first);
    EXPECT_EQ(test::readFile(platform.directory / "image.dmg"), base::toString(DiskImageBuilder().build()));
}

TEST_F(RealSyntheticCDHash, DependsOnDataAndTrailer) {
    const Data otherData = DiskImageBuilder().data(Data(1000, std::byte{0xDB})).build();
    Data otherTrailer = DiskImageBuilder().build();
    otherTrailer.back() ^= std::byte{1};
    test::writeFile(platform.directory / "data.dmg", base::ByteView(otherData));
    test::writeFile(platform.directory / "trailer.dmg", base::ByteView(otherTrailer));
    EXPECT_NE(hashOf("data.dmg"), hashOf("image.dmg"));
    EXPECT_NE(hashOf("trailer.dmg"), hashOf("image.dmg"));
}

}  // namespace
}  // namespace pinwell
