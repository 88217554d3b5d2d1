// Changes to a bundle outside the bytes of signed files, and packages with a hostile table.
#include <gmock/gmock.h>
#include <sys/stat.h>

#include <algorithm>
#include <filesystem>

#include "base/byte_source.h"
#include "gate_fixture.h"
#include "lumora-local/samples.h"
#include "support/archive_builder.h"
#include "support/executable_image_builder.h"
#include "verify/code.h"

namespace pinwell::test {
namespace {

using testing::Contains;
using testing::HasSubstr;
using testing::Not;
using verify::Outcome;

class AttackedBundle : public GateTest {
  protected:
    AttackedBundle() : bundle(lumora::writeSampleApplication(directory.path())) { staple(bundle); }

    void setMode(const std::string& below, int mode) const {
        std::filesystem::permissions(bundle + "/" + below, static_cast<std::filesystem::perms>(mode));
    }

    /// 65, with a failed check whose line contains this text.
    void expectRefusal(const std::string& place) const {
        const Result result = judge(bundle);
        EXPECT_EQ(gate::exitStatusOf(result.verdict), 65) << place;
        EXPECT_THAT(failuresOf(result), Contains(HasSubstr(place)));
    }

    /// 0, with a note at this place.
    void expectNote(const std::string& place) const {
        const Result result = judge(bundle);
        EXPECT_EQ(gate::exitStatusOf(result.verdict), 0) << place;
        std::vector<std::string> notes;
        for (const verify::Check& check : verify::flattened(result.checks))
            if (check.outcome == Outcome::noted) notes.push_back(check.place);
        EXPECT_THAT(notes, Contains(place));
    }

    const std::string bundle;
};

TEST_F(AttackedBundle, IsAdmittedUntouched) {
    EXPECT_EQ(exitStatusFor(bundle), 0);
}

TEST_F(AttackedBundle, IsRefusedWithoutTheExecuteBitOfItsProgram) {
    setMode("Contents/Programs/Sample", 0644);
    expectRefusal("bundle-structure: Contents/Programs/Sample");
}

TEST_F(AttackedBundle, IsRefusedWithoutTheExecuteBitOfNestedCode) {
    setMode("Contents/Programs/sample-tool", 0644);
    expectRefusal("bundle-structure: Contents/Programs/sample-tool");
}

TEST_F(AttackedBundle, IsNotedForAnEmptyDirectory) {
    std::filesystem::create_directories(bundle + "/Contents/Resources/new/newer");
    expectNote("Contents/Resources/new/newer");
}

TEST_F(AttackedBundle, IsNotedForAFileThatARuleLetsOut) {
    writeFile(bundle + "/Contents/Resources/.DS_Store", "text\n");
    expectNote("Contents/Resources/.DS_Store");
}

TEST_F(AttackedBundle, IsRefusedForCodeThatARuleLetsOut) {
    writeFile(bundle + "/Contents/Resources/.DS_Store", ExecutableImageBuilder().build());
    expectRefusal("unsealed: Contents/Resources/.DS_Store");
}

TEST_F(AttackedBundle, IsRefusedForALinkToTheOutsideThatARuleLetsOut) {
    std::filesystem::create_symlink("../../../outside", bundle + "/Contents/Resources/.DS_Store");
    expectRefusal("unsealed: Contents/Resources/.DS_Store");
}

TEST_F(AttackedBundle, IsRefusedForASpecialFileThatARuleLetsOut) {
    ASSERT_EQ(mkfifo((bundle + "/Contents/Resources/.DS_Store").c_str(), 0600), 0);
    expectRefusal("unsealed: Contents/Resources/.DS_Store");
}

TEST_F(AttackedBundle, IsRefusedForNamesThatDifferInCaseOrUnicodeForm) {
    writeFile(bundle + "/Contents/Resources/README.TXT", "text\n");
    expectRefusal("unsealed: Contents/Resources/README.TXT");
    std::filesystem::remove(bundle + "/Contents/Resources/README.TXT");
    std::filesystem::rename(bundle + "/Contents/Resources/ReadMe.txt", bundle +
                                                                           "/Contents/Resources/Re\xCC\x81"
                                                                           "adMe.txt");
    expectRefusal("missing: Contents/Resources/ReadMe.txt");
}

TEST_F(AttackedBundle, IsRefusedForAnExtraFileInOddPlaces) {
    for (const char* const place :
         {"Contents/_CodeSignature/new", "Contents/Frameworks/Greeting.framework/new",
          "Contents/Frameworks/Greeting.framework/Versions/B/new",
          "Contents/Frameworks/Greeting.framework/Versions/A/_CodeSignature/new",
          "Contents/Programs/Sample.dSYM/new", "Contents/_MASReceipt/receipt", "new/new"}) {
        writeFile(bundle + "/" + place, "text\n");
        EXPECT_EQ(exitStatusFor(bundle), 65) << place;
        std::filesystem::remove(bundle + "/" + place);
    }
}

TEST_F(AttackedBundle, IsRefusedForNestedCodeThatIsNoCode) {
    writeFile(bundle + "/Contents/Programs/sample-tool", "#!/bin/sh\n");
    expectRefusal("nested-code: Contents/Programs/sample-tool");
}

TEST_F(AttackedBundle, IsRefusedForANestedBundleThatIsALink) {
    const std::string framework = bundle + "/Contents/Frameworks/Greeting.framework";
    std::filesystem::rename(framework, directory / "Greeting.framework");
    std::filesystem::create_symlink(directory / "Greeting.framework", framework);
    expectRefusal("nested-code: Contents/Frameworks/Greeting.framework");
}

TEST_F(AttackedBundle, IsRefusedForAnUnsignedSliceOfItsProgram) {
    const std::string program = bundle + "/Contents/Programs/Sample";
    const Data added =
        UniversalImageBuilder()
            .slice(kSampleArm, lumora::makeSignedImage(kSampleArm, "other", {}))
            .slice(kSampleX86, ExecutableImageBuilder().cpuType(kSampleX86).withoutSignature().build())
            .build();
    writeFile(program, added);
    expectRefusal("signature: Contents/Programs/Sample, 64-bit x86 slice");
}

// Packages.

std::vector<verify::Check> checksOfTable(const std::string& files) {
    const Data archive = ArchiveBuilder()
                             .toc(
                                 "<?xml version=\"1.0\" encoding=\"UTF-8\"?><xar><toc><checksum "
                                 "style=\"sha1\"><offset>0</offset>"
                                 "<size>20</size></checksum>" +
                                 files + "</toc></xar>")
                             .afterChecksum(base::toData("data"))
                             .build();
    verify::Workers workers(1);
    verify::Section section;
    verify::verifyPackage(base::MemorySource(archive), workers, section);
    return verify::flattened(section);
}

std::vector<std::string> failuresOfTable(const std::string& files) {
    std::vector<std::string> failures;
    for (const verify::Check& check : checksOfTable(files))
        if (check.outcome == Outcome::failed) failures.push_back(check.name + ": " + check.place);
    return failures;
}

std::string fileNamed(const std::string& name, const std::string& inside = {}) {
    return "<file id=\"1\"><name>" + name + "</name>" + inside + "</file>";
}

std::string dataAt(int offset, int length) {
    return "<data><offset>" + std::to_string(offset) + "</offset><length>" + std::to_string(length) +
           "</length><archived-checksum style=\"sha1\">"
           "a17c9aaa61e80a1bf71d0d850af4e5baa9800bbd</archived-checksum></data>";  // of "data"
}

TEST(PackageTable, MayNameFilesOnceEach) {
    EXPECT_THAT(failuresOfTable(fileNamed("a", fileNamed("a", dataAt(20, 4))) + fileNamed("b")),
                Not(Contains(HasSubstr("archived-file"))));
}

TEST(PackageTable, IsRefusedForNamesThatLeadElsewhere) {
    for (const char* const name : {"", ".", "..", "../a", "/a", "a/b"})
        EXPECT_THAT(failuresOfTable(fileNamed(name)), Contains(HasSubstr("archived-file"))) << name;
}

TEST(PackageTable, IsRefusedForTwoEntriesOfOneFile) {
    EXPECT_THAT(failuresOfTable(fileNamed("a", dataAt(20, 4)) + fileNamed("a")),
                Contains("archived-file: a"));
    EXPECT_THAT(failuresOfTable(fileNamed("d", fileNamed("a") + fileNamed("a"))),
                Contains("archived-file: d/a"));
}

TEST(PackageTable, ReportsAnEntryWithoutAChecksum) {
    const std::string data = "<data><offset>20</offset><length>4</length></data>";
    const std::vector<verify::Check> checks = checksOfTable(fileNamed("a", data));
    const auto isFault = [](const verify::Check& check) {
        return check.place == "a" && check.outcome == Outcome::failed;
    };
    const auto fault = std::find_if(checks.begin(), checks.end(), isFault);
    ASSERT_NE(fault, checks.end());
    EXPECT_EQ(fault->expected, "an archived checksum");
}

TEST(PackageTable, IsRefusedForRangesThatOverlapOrLeadOutside) {
    EXPECT_THAT(failuresOfTable(fileNamed("a", dataAt(20, 4)) + fileNamed("b", dataAt(22, 2))),
                Contains(HasSubstr("heap: b")));
    EXPECT_THAT(failuresOfTable(fileNamed("a", dataAt(10, 4))), Contains(HasSubstr("heap: a")));
    EXPECT_THAT(failuresOfTable(fileNamed("a", dataAt(21, 4))), Contains("archived-file: a"));
}

TEST(PackageTable, IsRefusedForBytesAfterItsLastEntry) {
    EXPECT_THAT(failuresOfTable(""), Contains(HasSubstr("heap: heap (bytes ")));
}

}  // namespace
}  // namespace pinwell::test
