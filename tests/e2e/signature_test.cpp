// The verbose output about a code signature, and the signatures that give a file its hash.
#include <filesystem>

#include "fixture.h"
#include "support/cms_signer.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;
using testing::StartsWith;

class Signature : public EndToEndTest {
  protected:
    /// Signed by somebody, at a time that an authority vouches for.
    static CodeDirectoryBuilder signedDirectory() {
        return CodeDirectoryBuilder()
            .flags(0)
            .identifier("com.example.signed")
            .team("TEAM123456")
            .covers(2, emptyRequirements());
    }
    static Data imageSignedWith(const Data& codeDirectory, const Data& cms) {
        return ExecutableImageBuilder()
            .signature(
                SuperBlobBuilder().blob(0, codeDirectory).blob(2, emptyRequirements()).cms(cms).build())
            .build();
    }
    /// Gives the bundle this executable and this hash.
    void replaceBundle(const Data& executable, const Data& codeDirectory) {
        BundleBuilder().executable(executable).write(bundle);
        hash = codeHashOf(2, codeDirectory);
    }
    ProcessResult stapleVerbosely() {
        serveTicket(ticket());
        return pinwell({"staple", "-v", bundle});
    }
    testing::Matcher<const ProcessResult&> HasNoHash() const {
        return Ended(66,
                     AllOf(Contains("Props are {"), Contains("Cannot download ticket. CDHash must be set.")));
    }
};

TEST_F(Signature, AnAdHocSignatureNamesNoTeamAndNoTime) {
    const ProcessResult result = stapleVerbosely();
    EXPECT_THAT(result, Ended(0, AllOf(Contains(HasSubstr("cdhash = {length = 20, bytes = 0x")),
                                       Contains("    digestAlgorithm = 2;"), Contains("    flags = 2;"),
                                       Contains("    signingId = com.example.sample;"))));
    EXPECT_THAT(result.output, Not(HasSubstr("teamId")));
    EXPECT_THAT(result.output, Not(HasSubstr("secureTimestamp")));
}

TEST_F(Signature, ASignersSignatureNamesTeamAndTime) {
    const Data codeDirectory = signedDirectory().build();
    for (const TestKey key : {TestKey::ecP256, TestKey::rsa2048}) {
        const Data cms = CmsBuilder(codeDirectory).key(key).timestamp(TimestampBuilder()).build();
        replaceBundle(imageSignedWith(codeDirectory, cms), codeDirectory);
        EXPECT_THAT(stapleVerbosely(),
                    Ended(0, AllOf(Contains("    teamId = TEAM123456;"),
                                   Contains("    signingId = com.example.signed;"),
                                   Contains("    secureTimestamp = \"2026-11-20 19:55:00 +0000\";"))));
    }
}

TEST_F(Signature, ATimeWithoutATimestampIsNotShown) {
    const Data codeDirectory = signedDirectory().build();
    const Data cms = CmsBuilder(codeDirectory).timestamp(TimestampBuilder().brokenSignature()).build();
    replaceBundle(imageSignedWith(codeDirectory, cms), codeDirectory);
    const ProcessResult result = stapleVerbosely();
    EXPECT_EQ(result.exitStatus, 0);
    EXPECT_THAT(result.output, Not(HasSubstr("secureTimestamp")));
}

TEST_F(Signature, ASignatureThatDoesNotVerifyGivesNoHash) {
    const Data codeDirectory = signedDirectory().build();
    replaceBundle(imageSignedWith(codeDirectory, CmsBuilder(codeDirectory).brokenSignature().build()),
                  codeDirectory);
    EXPECT_THAT(stapleVerbosely(), HasNoHash());
    replaceBundle(imageSignedWith(codeDirectory, base::toData("not a message")), codeDirectory);
    EXPECT_THAT(stapleVerbosely(), HasNoHash());
    EXPECT_THAT(service().connections(), testing::IsEmpty());
}

TEST_F(Signature, ASignatureThatIsNeitherSignedNorAdHocGivesNoHash) {
    const Data codeDirectory = signedDirectory().build();
    replaceBundle(imageSignedWith(codeDirectory, {}), codeDirectory);
    EXPECT_THAT(stapleVerbosely(), HasNoHash());
}

TEST_F(Signature, AScriptsBundleKeepsItsSignatureInFilesOfTheirOwn) {
    const Data codeDirectory = CodeDirectoryBuilder().covers(2, emptyRequirements()).build();
    BundleBuilder()
        .executable(base::toData("#!/bin/sh\n"))
        .separateSignature(codeDirectory, emptyRequirements(), {})
        .write(bundle);
    serveTicket(ticket());
    EXPECT_THAT(staple(), Ended(0, ElementsAre(processing(), processing(), kWorked)));
}

TEST_F(Signature, AnIdentifierCannotDriveTheTerminal) {
    const Data codeDirectory =
        CodeDirectoryBuilder().identifier("com.\x1b[2Jexample").covers(2, emptyRequirements()).build();
    replaceBundle(ExecutableImageBuilder().signature(SuperBlobBuilder::adHoc(codeDirectory).build()).build(),
                  codeDirectory);
    const ProcessResult result = stapleVerbosely();
    EXPECT_THAT(result, Ended(0, Contains(StartsWith("    signingId = \"com.\\x1b[2Jexample\""))));
}

}  // namespace
}  // namespace pinwell::test
