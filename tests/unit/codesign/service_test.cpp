#include "codesign/service.h"

#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "service_fixture.h"
#include "support/cms_signer.h"

namespace pinwell::test {
namespace {

using codesign::kInvalidSignature;
using codesign::kParameterError;
using codesign::kStaticCodeNotFound;
using codesign::kSuccess;
using codesign::kUnimplemented;
using codesign::kUnsigned;

class StaticCodeOfAPath : public CodeSigningTest {};

TEST_F(StaticCodeOfAPath, IsAThinImageWithItsSignature) {
    const Data codeDirectory = codeDirectoryNamed("com.example.tool");
    const Answer answer = askAbout(imageNamed("com.example.tool"));
    EXPECT_EQ(answer.created, kSuccess);
    EXPECT_EQ(answer.validity, kSuccess);
    EXPECT_EQ(answer.copied, kSuccess);
    EXPECT_EQ(answer.information.unique, codeHashOf(2, codeDirectory));
    EXPECT_EQ(answer.information.cdHashes, std::vector<Data>{codeHashOf(2, codeDirectory)});
    EXPECT_EQ(answer.information.digestAlgorithms, std::vector<std::uint32_t>{2});
    EXPECT_EQ(answer.information.identifier, "com.example.tool");
    EXPECT_EQ(answer.information.digestAlgorithm, 2U);
    EXPECT_EQ(answer.information.flags, 2U);
    EXPECT_EQ(answer.information.teamIdentifier, std::nullopt);
    EXPECT_EQ(answer.information.secureTimestamp, std::nullopt);
}

TEST_F(StaticCodeOfAPath, IsThePreferredSliceOfAUniversalImage) {
    const auto universal =
        UniversalImageBuilder().slice(kSampleX86, imageNamed("x")).slice(kSampleArm, imageNamed("a"));
    EXPECT_EQ(askAbout(universal.build()).information.identifier, "a");
    EXPECT_EQ(askAbout(UniversalImageBuilder(universal).wide().build()).information.identifier, "a");
}

TEST_F(StaticCodeOfAPath, IsUnsignedWhereThePreferredSliceIs) {
    const Data plain = ExecutableImageBuilder().withoutSignature().build();
    EXPECT_EQ(
        askAbout(UniversalImageBuilder().slice(kSampleX86, imageNamed("x")).slice(kSampleArm, plain).build())
            .validity,
        kUnsigned);
}

TEST_F(StaticCodeOfAPath, IsTheMainExecutableOfABundle) {
    BundleBuilder().write(scratch / "Sample.app");
    const Answer answer = ask(scratch / "Sample.app");
    EXPECT_EQ(answer.validity, kSuccess);
    EXPECT_EQ(answer.information.identifier, "com.example.sample");
}

TEST_F(StaticCodeOfAPath, OfAnUnsignedBundleIsFoundAndSaysNothing) {
    BundleBuilder()
        .executable(ExecutableImageBuilder().withoutSignature().build())
        .write(scratch / "Sample.app");
    const Answer answer = ask(scratch / "Sample.app");
    EXPECT_EQ(answer.created, kSuccess);
    EXPECT_EQ(answer.validity, kUnsigned);
    EXPECT_EQ(answer.copied, kSuccess);
    EXPECT_EQ(answer.information.unique, std::nullopt);
    EXPECT_TRUE(answer.information.cdHashes.empty());
}

TEST_F(StaticCodeOfAPath, IsAnyOtherFileWithoutASignature) {
    EXPECT_EQ(askAbout(base::toData("some text")).validity, kUnsigned);
    EXPECT_EQ(askAbout({}).validity, kUnsigned);
}

TEST_F(StaticCodeOfAPath, IsNothingWhereNothingIs) {
    EXPECT_EQ(ask(scratch / "missing").created, kStaticCodeNotFound);
    writeFile(scratch / "file", "text");
    EXPECT_EQ(ask(scratch / "file/below").created, kStaticCodeNotFound);
}

TEST_F(StaticCodeOfAPath, IsNothingInADirectoryWithoutMainExecutable) {
    std::filesystem::create_directory(scratch / "Sample.app");
    EXPECT_EQ(ask(scratch / "Sample.app").created, kStaticCodeNotFound);
    codesign::FileCodeSigningService blind(
        {std::make_shared<base::Places>(), [](auto&, const std::string&) { return std::nullopt; }});
    EXPECT_EQ(statusOf(blind.staticCode(scratch.url("Sample.app"), 0)), kStaticCodeNotFound);
}

TEST_F(StaticCodeOfAPath, DoesNotFollowALink) {
    writeFile(scratch / "image", imageNamed("a"));
    std::filesystem::create_symlink(scratch / "image", scratch / "link");
    EXPECT_EQ(ask(scratch / "link").created, kStaticCodeNotFound);
    BundleBuilder().write(scratch / "Sample.app");
    std::filesystem::create_directory_symlink(scratch / "Sample.app", scratch / "Link.app");
    EXPECT_EQ(ask(scratch / "Link.app").created, kStaticCodeNotFound);
}

TEST_F(StaticCodeOfAPath, DoesNotWaitForAPipe) {
    ASSERT_EQ(mkfifo((scratch / "pipe").c_str(), 0600), 0);
    EXPECT_EQ(ask(scratch / "pipe").created, kStaticCodeNotFound);
}

TEST_F(StaticCodeOfAPath, EndsCleanlyWhereverTheFileIsCut) {
    const Data whole = UniversalImageBuilder().build();
    for (std::size_t length = 0; length < whole.size(); ++length) {
        const Answer answer =
            askAbout(Data(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(length)));
        EXPECT_NE(answer.validity, kSuccess) << length;
        EXPECT_EQ(answer.information.unique, std::nullopt) << length;
    }
}

TEST_F(StaticCodeOfAPath, FailsCleanlyWhenTheFileShrinksUnderIt) {
    writeFile(scratch / "image", imageNamed("a"));
    const std::shared_ptr<codesign::StaticCode> code = codeAt("image");
    ASSERT_EQ(truncate((scratch / "image").c_str(), 100), 0);
    EXPECT_EQ(statusOf(service.checkValidity(*code, kValidityFlags)), codesign::kIOError);
}

TEST_F(StaticCodeOfAPath, IsAboutTheFileThatWasFound) {
    writeFile(scratch / "image", imageNamed("old"));
    const std::shared_ptr<codesign::StaticCode> code = codeAt("image");
    writeFile(scratch / "other", imageNamed("new"));
    std::filesystem::rename(scratch / "other", scratch / "image");
    EXPECT_EQ(informationOf(*code, kAllSets).identifier, "old");
}

TEST_F(StaticCodeOfAPath, NeedsGoodParameters) {
    writeFile(scratch / "image", imageNamed("a"));
    EXPECT_EQ(statusOf(service.staticCode(scratch.url("image"), 1)), kParameterError);
    EXPECT_EQ(statusOf(service.staticCode(*values::URL::fromString("https://a.example/b"), 0)),
              kParameterError);
    EXPECT_EQ(statusOf(service.staticCode(values::URL::fileURLWithPath(""), 0)), kParameterError);
    const std::shared_ptr<codesign::StaticCode> code = codeAt("image");
    EXPECT_EQ(statusOf(service.checkValidity(*code, codesign::kDoNotValidateExecutable)), kUnimplemented);
    EXPECT_EQ(statusOf(service.checkValidity(*code, 0)), kUnimplemented);
}

TEST_F(StaticCodeOfAPath, MustBeOfTheSameService) {
    struct Foreign : codesign::StaticCode {};
    Foreign foreign;
    EXPECT_EQ(statusOf(service.checkValidity(foreign, kValidityFlags)), kParameterError);
    EXPECT_EQ(statusOf(service.signingInformation(foreign, kAllSets)), kParameterError);
    EXPECT_EQ(statusOf(service.setDetachedSignature(foreign, {}, 0)), kParameterError);
}

TEST_F(StaticCodeOfAPath, LeavesTheTeamToTheSigningSet) {
    const Data codeDirectory = CodeDirectoryBuilder().team("TEAM123456").build();
    writeFile(scratch / "image",
              ExecutableImageBuilder().signature(SuperBlobBuilder::adHoc(codeDirectory).build()).build());
    const std::shared_ptr<codesign::StaticCode> code = codeAt("image");
    EXPECT_EQ(informationOf(*code, codesign::kSigningInformation).teamIdentifier, "TEAM123456");
    const codesign::SigningInformation internal = informationOf(*code, codesign::kInternalInformation);
    EXPECT_EQ(internal.teamIdentifier, std::nullopt);
    EXPECT_EQ(internal.unique, codeHashOf(2, codeDirectory));
}

class SeparateSignature : public CodeSigningTest {
  protected:
    static inline const Data kScript = base::toData("#!/bin/sh\n");

    Answer askAboutBundle(const BundleBuilder& bundle) {
        bundle.write(scratch / "Sample.app");
        return ask(scratch / "Sample.app");
    }
};

TEST_F(SeparateSignature, IsInFilesOfTheBundle) {
    const Data codeDirectory = CodeDirectoryBuilder().flags(0).covers(2, emptyRequirements()).build();
    const Data cms = CmsBuilder(codeDirectory).timestamp(TimestampBuilder()).build();
    const Answer answer = askAboutBundle(
        BundleBuilder().executable(kScript).separateSignature(codeDirectory, emptyRequirements(), cms));
    EXPECT_EQ(answer.validity, kSuccess);
    EXPECT_EQ(answer.information.unique, codeHashOf(2, codeDirectory));
    EXPECT_EQ(answer.information.secureTimestamp, values::Date{1795204500});
}

TEST_F(SeparateSignature, MayBeAdHoc) {
    const Data codeDirectory = CodeDirectoryBuilder().build();
    EXPECT_EQ(
        askAboutBundle(BundleBuilder().executable(kScript).separateSignature(codeDirectory, {}, {})).validity,
        kSuccess);
}

TEST_F(SeparateSignature, IsMissingWithoutItsCodeDirectory) {
    EXPECT_EQ(askAboutBundle(BundleBuilder().executable(kScript)).validity, kUnsigned);
    EXPECT_EQ(
        askAboutBundle(BundleBuilder().executable(kScript).separateSignature({}, emptyRequirements(), {}))
            .validity,
        kUnsigned);
}

TEST_F(SeparateSignature, RefusesOtherRequirements) {
    const Data codeDirectory = CodeDirectoryBuilder().covers(2, emptyRequirements()).build();
    const Data other = makeBlob(0xFADE0C01, Data(8));
    EXPECT_EQ(askAboutBundle(BundleBuilder().executable(kScript).separateSignature(codeDirectory, other, {}))
                  .validity,
              kInvalidSignature);
}

TEST_F(SeparateSignature, RefusesAnotherDirectorysCms) {
    const Data codeDirectory = CodeDirectoryBuilder().flags(0).build();
    const Data cms = CmsBuilder(base::toData("another")).build();
    EXPECT_EQ(askAboutBundle(BundleBuilder().executable(kScript).separateSignature(codeDirectory, {}, cms))
                  .validity,
              kInvalidSignature);
}

TEST_F(SeparateSignature, RefusesAMalformedCodeDirectory) {
    EXPECT_EQ(
        askAboutBundle(BundleBuilder().executable(kScript).separateSignature(Data(50), {}, {})).validity,
        kInvalidSignature);
}

// 2 GiB of executable take that much: 32 bytes for each page of 4 KiB.
TEST_F(SeparateSignature, HasACodeDirectoryOfAnyLength) {
    constexpr std::uint32_t kLength = 20U * 1024 * 1024;
    Data codeDirectory = CodeDirectoryBuilder().length(kLength).build();
    codeDirectory.resize(kLength);
    const auto answer =
        askAboutBundle(BundleBuilder().executable(kScript).separateSignature(codeDirectory, {}, {}));
    EXPECT_EQ(answer.validity, kSuccess);
    EXPECT_EQ(answer.information.unique, codeHashOf(2, codeDirectory));
}

TEST_F(SeparateSignature, IsNotReadThroughALink) {
    askAboutBundle(BundleBuilder().executable(kScript));
    writeFile(scratch / "elsewhere", CodeDirectoryBuilder().build());
    std::filesystem::create_directory(scratch / "Sample.app/Contents/_CodeSignature");
    std::filesystem::create_symlink(scratch / "elsewhere",
                                    scratch / "Sample.app/Contents/_CodeSignature/CodeDirectory");
    EXPECT_EQ(ask(scratch / "Sample.app").validity, kUnsigned);
}

TEST_F(SeparateSignature, CountsForNothingBesideAnExecutableImage) {
    const Data codeDirectory = codeDirectoryNamed("separate");
    EXPECT_EQ(askAboutBundle(BundleBuilder().separateSignature(codeDirectory, {}, {})).information.identifier,
              "com.example.sample");
}

}  // namespace
}  // namespace pinwell::test
