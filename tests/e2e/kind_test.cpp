// The paths that the tool accepts, and its messages about others.
#include <sys/stat.h>

#include <filesystem>

#include "fixture.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::ElementsAre;
using testing::Not;
using testing::StartsWith;

/// The ordinary run has a service that would respond; no run with these paths gets that far.
class Kind : public EndToEndTest {
  protected:
    std::string path(const std::string& name) const { return directory / ("builds/" + name); }

    void expectIncapable(const std::string& name, const std::string& noun) const {
        for (const char* word : {"staple", "validate"}) {
            EXPECT_THAT(pinwell({word, path(name)}),
                        Ended(66, ElementsAre("Processing: " + path(name),
                                              "Pinwell is incapable of working with " + noun + " files.")))
                << word;
        }
    }

    /// Accepted as a bundle: the message is that it has no ticket.
    void expectBundle(const std::string& name) const {
        EXPECT_THAT(pinwell({"validate", path(name)}),
                    Ended(65, ElementsAre("Processing: " + path(name),
                                          name + " does not have a ticket stapled to it.")));
    }
};

TEST_F(Kind, AnApplicationIsABundle) {
    expectBundle("Sample.app");
}

TEST_F(Kind, AnExtensionIsComparedWithoutRegardToCase) {
    BundleBuilder().write(path("Sample.APP"));
    expectBundle("Sample.APP");
}

TEST_F(Kind, KernelExtensionsAreBundlesInCapitalsToo) {
    BundleBuilder().write(path("Sample.kext"));
    BundleBuilder().write(path("Sample.KEXT"));
    expectBundle("Sample.kext");
    expectBundle("Sample.KEXT");
}

TEST_F(Kind, PanesSaversMenusAndWidgetsAreBundles) {
    for (const std::string extension : {"wdgt", "prefpane", "saver", "slidesaver", "menu"}) {
        BundleBuilder().write(path("Sample." + extension));
        expectBundle("Sample." + extension);
    }
}

TEST_F(Kind, GenericBundlesWithAMainExecutableAreBundles) {
    for (const std::string extension : {"bundle", "plugin"}) {
        BundleBuilder().write(path("Sample." + extension));
        expectBundle("Sample." + extension);
    }
}

TEST_F(Kind, AFrameworkWithAMainExecutableIsABundle) {
    const std::string current = path("Sample.framework/Versions/A");
    writeFile(current + "/Sample", readFile(bundle + "/Contents/Programs/Sample"));
    std::filesystem::create_symlink("A", path("Sample.framework/Versions/Current"));
    expectBundle("Sample.framework");
}

TEST_F(Kind, AFrameworkWithoutAMainExecutableIsRefused) {
    std::filesystem::create_directories(path("Empty.framework/Versions/A"));
    const ProcessResult result = pinwell({"staple", path("Empty.framework")});
    EXPECT_THAT(result, Ended(66, ElementsAre("Processing: " + path("Empty.framework"),
                                              AllOf(StartsWith("Pinwell is incapable of working with "),
                                                    testing::EndsWith(" files.")))));
}

TEST_F(Kind, ADirectoryOfAnyNameWithAMainExecutableIsABundle) {
    BundleBuilder().write(path("Sample"));
    BundleBuilder().write(path("Sample.unheard-of"));
    expectBundle("Sample");
    expectBundle("Sample.unheard-of");
}

TEST_F(Kind, APlainFolderIsRefused) {
    std::filesystem::create_directory(path("things"));
    expectIncapable("things", "folder");
}

TEST_F(Kind, ATextFileIsRefused) {
    writeFile(path("notes.txt"), std::string_view("text"));
    const ProcessResult result = pinwell({"validate", path("notes.txt")});
    // "plain text document" with a shared MIME database, "document" without one.
    EXPECT_THAT(result, Ended(66, ElementsAre("Processing: " + path("notes.txt"),
                                              AllOf(StartsWith("Pinwell is incapable of working with "),
                                                    testing::EndsWith("document files.")))));
}

TEST_F(Kind, AFileWithoutExtensionIsRefused) {
    writeFile(path("data"), std::string_view("\x7f"));
    expectIncapable("data", "document");
}

TEST_F(Kind, ASymbolicLinkIsNotFollowed) {
    std::filesystem::create_symlink(bundle, path("Link.app"));
    expectIncapable("Link.app", "alias");
}

TEST_F(Kind, ALinkThatLeadsNowhereIsStillALink) {
    std::filesystem::create_symlink(path("nowhere"), path("Link.app"));
    expectIncapable("Link.app", "alias");
}

TEST_F(Kind, ALinkInAnEarlierComponentIsFollowed) {
    std::filesystem::create_directory_symlink(path(""), path("here"));
    EXPECT_THAT(pinwell({"validate", path("here/Sample.app")}),
                Ended(65, ElementsAre("Processing: " + path("here/Sample.app"),
                                      "Sample.app does not have a ticket stapled to it.")));
}

TEST_F(Kind, AFifoIsRefusedWithoutWaitingForItsWriter) {
    ASSERT_EQ(mkfifo(path("Fifo.app").c_str(), 0700), 0);
    const ProcessResult result = pinwell({"staple", path("Fifo.app")});
    EXPECT_EQ(result.exitStatus, 66);
    EXPECT_THAT(result.outputLines(), Contains(StartsWith("Pinwell is incapable of working with ")));
}

TEST_F(Kind, APlainExecutableIsHandledAsABundle) {
    std::filesystem::copy_file(bundle + "/Contents/Programs/Sample", path("tool"));
    expectBundle("tool");
}

TEST_F(Kind, UnsignedCodeHasNoHashAndCausesNoTraffic) {
    BundleBuilder().executable(ExecutableImageBuilder().withoutSignature().build()).write(path("Plain.app"));
    service();
    EXPECT_THAT(pinwell({"staple", path("Plain.app")}),
                Ended(66, ElementsAre("Processing: " + path("Plain.app"))));
    const ProcessResult verbose = pinwell({"validate", "-v", path("Plain.app")});
    EXPECT_THAT(verbose, Ended(66, Contains("Cannot download ticket. CDHash must be set.")));
    EXPECT_THAT(verbose.outputLines(), Not(Contains(StartsWith("JSON Data is "))));
    EXPECT_THAT(service().connections(), testing::IsEmpty());
}

TEST_F(Kind, CodeWhoseSignatureIsDamagedHasNoHash) {
    const auto damaged =
        CodeDirectoryBuilder().covers(2, Data(12)).build();  // not the requirements that are there
    BundleBuilder()
        .executable(ExecutableImageBuilder().signature(SuperBlobBuilder::adHoc(damaged).build()).build())
        .write(path("Damaged.app"));
    EXPECT_THAT(pinwell({"staple", "-v", path("Damaged.app")}),
                Ended(66, Contains("Cannot download ticket. CDHash must be set.")));
}

TEST_F(Kind, AnApplicationWithoutAnExecutableHasNoHash) {
    std::filesystem::create_directories(path("Hollow.app/Contents"));
    EXPECT_THAT(pinwell({"staple", path("Hollow.app")}),
                Ended(66, ElementsAre("Processing: " + path("Hollow.app"))));
}

}  // namespace
}  // namespace pinwell::test
