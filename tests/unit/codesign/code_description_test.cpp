// Descriptions of code are read tolerantly; for good code they agree with the service.
#include "codesign/code_description.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "codesign/superblob.h"
#include "support/cms_signer.h"
#include "support/code_directory_builder.h"
#include "support/disk_image_builder.h"
#include "support/executable_image_builder.h"
#include "support/temporary_directory.h"

namespace pinwell::codesign {
namespace {

using test::CodeDirectoryBuilder;
using test::SuperBlobBuilder;
using testing::SizeIs;

TEST(SuperBlobSurvey, ListsBlobsThatPointOutsideOrReachTooFar) {
    const Data bytes = SuperBlobBuilder()
                           .blob(0, test::makeBlob(1, Data(4)))
                           .blob(5, test::makeBlob(2, Data(4)))
                           .offsetOf(5, 5000)
                           .build();
    std::uint32_t count = 0;
    const auto blobs = surveySuperBlob(bytes, 10, count);
    EXPECT_EQ(count, 2U);
    ASSERT_THAT(blobs, SizeIs(2));
    EXPECT_EQ(blobs[0].bytes.size(), 12U);
    EXPECT_EQ(blobs[1].offset, 5000U);
    EXPECT_FALSE(blobs[1].length);
}

TEST(SuperBlobSurvey, EndsWhereTheIndexIsCutOff) {
    const Data bytes = SuperBlobBuilder().count(1000).build();
    std::uint32_t count = 0;
    EXPECT_THAT(surveySuperBlob(bytes, 10, count), SizeIs(0));
    EXPECT_EQ(count, 1000U);
    EXPECT_THAT(surveySuperBlob(ByteView(bytes).first(9), 10, count), SizeIs(0));
    EXPECT_EQ(count, 0U);
}

TEST(SuperBlobSurvey, ListsNoMoreThanItMay) {
    SuperBlobBuilder builder;
    for (std::uint32_t slot = 0; slot < 20; ++slot) builder.blob(slot, test::makeBlob(1, {}));
    std::uint32_t count = 0;
    EXPECT_THAT(surveySuperBlob(builder.build(), 7, count), SizeIs(7));
    EXPECT_EQ(count, 20U);
}

TEST(SignatureDescription, KeepsTheGoodDirectoryBesideABadOne) {
    const Data good = CodeDirectoryBuilder().build();
    const Data bad = CodeDirectoryBuilder().digestType(1).identifierOffset(9999).build();
    const SignatureDescription description =
        describeSignature(SuperBlobBuilder::adHoc(good).blob(0x1000, bad).build());
    ASSERT_THAT(description.directories, SizeIs(2));
    EXPECT_EQ(description.directories[0].codeHash, test::codeHashOf(2, good));
    EXPECT_EQ(description.directories[0].problem, "");
    EXPECT_NE(description.directories[1].problem, "");
    EXPECT_EQ(description.validity, kInvalidSignature);
}

TEST(SignatureDescription, ShowsTheTimeStampOfTheSigner) {
    const Data directory = CodeDirectoryBuilder().flags(0).build();
    const Data cms = test::CmsBuilder(directory).timestamp({}).build();
    const SignatureDescription description =
        describeSignature(SuperBlobBuilder().blob(0, directory).cms(cms).build());
    EXPECT_EQ(description.validity, kSuccess) << description.problem;
    EXPECT_EQ(description.cmsLength, cms.size());
    EXPECT_EQ(description.secureTimestamp->seconds, 1795204500);
}

TEST(SignatureDescription, OfATicketAloneIsThatOfUnsignedCode) {
    const SignatureDescription description =
        describeSignature(SuperBlobBuilder().blob(0x10002, test::ticketBlob("ticket")).build());
    EXPECT_EQ(description.validity, kUnsigned);
    ASSERT_THAT(description.blobs, SizeIs(1));
    EXPECT_EQ(description.blobs[0].length, 14U);
}

class Description : public testing::Test {
  protected:
    CodeDescription describe(const std::string& name, const Data& contents) {
        test::writeFile(directory / name, contents);
        return describeCode(directory / name);
    }
    test::TemporaryDirectory directory;
};

TEST_F(Description, CoversTheTrailerOfADiskImage) {
    const auto image = test::DiskImageBuilder().superblob(test::DiskImageBuilder::signature());
    const CodeDescription description = describe("a.dmg", image.build());
    EXPECT_EQ(description.kind, CodeKind::diskImage);
    ASSERT_TRUE(description.preferredSlice()->signature);
    EXPECT_EQ(description.preferredSlice()->signature->validity, kSuccess);
    EXPECT_EQ(description.preferredSlice()->signature->place->offset, 1000U);
}

TEST_F(Description, SaysThatASuperblobCannotBeParsedAndShowsItAllTheSame) {
    Data bytes = test::ExecutableImageBuilder().build();
    const CodeDescription whole = describe("whole", bytes);
    const FileRange place = *whole.preferredSlice()->signature->place;
    bytes[place.offset] ^= std::byte{1};
    const CodeDescription broken = describe("broken", bytes);
    const SignatureDescription& signature = *broken.preferredSlice()->signature;
    EXPECT_EQ(signature.validity, kInvalidSignature);
    EXPECT_EQ(signature.problem, "not a superblob");
    EXPECT_EQ(signature.directories.at(0).codeHash,
              whole.preferredSlice()->signature->directories.at(0).codeHash);
}

TEST_F(Description, ReadsASignatureInSeparateFiles) {
    const Data codeDirectory = CodeDirectoryBuilder().covers(2, test::emptyRequirements()).build();
    test::BundleBuilder()
        .executable(base::toData("#!/bin/sh\n"))
        .separateSignature(codeDirectory, test::emptyRequirements(), {})
        .write(directory / "Script.app");
    const CodeDescription description = describeCode(directory / "Script.app");
    EXPECT_EQ(description.kind, CodeKind::separatelySigned);
    const SignatureDescription& signature = *description.preferredSlice()->signature;
    EXPECT_FALSE(signature.place);
    EXPECT_EQ(signature.validity, kSuccess) << signature.problem;
    EXPECT_EQ(signature.directories.at(0).codeHash, test::codeHashOf(2, codeDirectory));
}

TEST_F(Description, OfNothingNamesTheMissingPart) {
    const CodeDescription description = describeCode(directory / "missing");
    EXPECT_EQ(description.status, kStaticCodeNotFound);
    EXPECT_NE(description.problem, "");
    EXPECT_EQ(description.preferredSlice(), nullptr);
}

}  // namespace
}  // namespace pinwell::codesign
