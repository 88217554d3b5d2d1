// The place of a bundle's ticket, and failures to write it there.
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "fixture.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::ElementsAre;
using testing::StartsWith;

class Bundle : public EndToEndTest {
  protected:
    Bundle() { serveTicket(genuine); }

    static std::string urlOf(const std::string& path) {
        return values::URL::fileURLWithPath(path).absoluteString();
    }
    /// One line fewer than a good staple, and status 73.
    testing::Matcher<const ProcessResult&> CouldNotBeWritten(const std::string& path) const {
        return Ended(73, ElementsAre("Processing: " + path, stapleFailed(73)));
    }
    ProcessResult stapleVerbosely(const std::string& path) const { return pinwell({"staple", "-v", path}); }

    const Data genuine = ticket();
};

TEST_F(Bundle, GetsExactlyTheBytesOfTheTicketAndValidatesFromThenOn) {
    EXPECT_THAT(staple(), Ended(0, ElementsAre(processing(), processing(), kWorked)));
    EXPECT_EQ(stapled(), genuine);
    EXPECT_THAT(validate(), Ended(0, ElementsAre(processing(), kValidated)));
}

TEST_F(Bundle, ChangesInNothingButItsTicket) {
    const std::string executable = readFile(bundle + "/Contents/Programs/Sample");
    const std::string propertyList = readFile(bundle + "/Contents/Info.plist");
    ASSERT_EQ(staple().exitStatus, 0);
    EXPECT_EQ(readFile(bundle + "/Contents/Programs/Sample"), executable);
    EXPECT_EQ(readFile(bundle + "/Contents/Info.plist"), propertyList);
    EXPECT_THAT(namesBelow(directory / "builds"),
                ElementsAre("Sample.app", "Sample.app/Contents", "Sample.app/Contents/CodeResources",
                            "Sample.app/Contents/Info.plist", "Sample.app/Contents/Programs",
                            "Sample.app/Contents/Programs/Sample"));
}

TEST_F(Bundle, AnOlderTicketIsReplaced) {
    const Data older = sealed(payload().signatureTime(1));
    ASSERT_NE(older, genuine);
    stapleByHand(older);
    EXPECT_THAT(staple(), Ended(0, ElementsAre(processing(), processing(), kWorked)));
    EXPECT_EQ(stapled(), genuine);
}

TEST_F(Bundle, ALongerFileInTheTicketsPlaceLeavesNothingBehind) {
    stapleByHand(Data(100000, std::byte{0x55}));
    EXPECT_EQ(staple().exitStatus, 0);
    EXPECT_EQ(stapled(), genuine);
}

TEST_F(Bundle, CanBeStapledAgainAndAgain) {
    for (int i = 0; i < 3; ++i) EXPECT_EQ(staple().exitStatus, 0);
    EXPECT_EQ(stapled(), genuine);
}

TEST_F(Bundle, ACompatibilityLinkIsLeftAlone) {
    const std::string target = directory / "builds/target";
    writeFile(target, std::string_view("precious"));
    std::filesystem::create_symlink(target, ticketPath());
    EXPECT_THAT(staple(), CouldNotBeWritten(bundle));
    EXPECT_THAT(stapleVerbosely(bundle),
                Ended(73, Contains("pinwell will not replace the compatibility symlink at " +
                                   urlOf(ticketPath()) + ". Please remove it manually")));
    EXPECT_EQ(std::filesystem::read_symlink(ticketPath()), target);
    EXPECT_EQ(readFile(target), "precious");
}

TEST_F(Bundle, ACompatibilityLinkThatLeadsNowhereIsLeftAlone) {
    std::filesystem::create_symlink("_CodeSignature/CodeResources", ticketPath());
    EXPECT_THAT(staple(), CouldNotBeWritten(bundle));
    EXPECT_TRUE(std::filesystem::is_symlink(ticketPath()));
    EXPECT_FALSE(std::filesystem::exists(bundle + "/Contents/_CodeSignature"));
}

TEST_F(Bundle, ALinkToAGoodTicketIsNoTicket) {
    const std::string target = directory / "builds/target";
    writeFile(target, genuine);
    std::filesystem::create_symlink(target, ticketPath());
    EXPECT_THAT(validate(),
                Ended(65, ElementsAre(processing(), "Sample.app does not have a ticket stapled to it.")));
}

TEST_F(Bundle, ADirectoryInTheTicketsPlaceIsLeftAlone) {
    writeFile(ticketPath() + "/inside", std::string_view("kept"));
    EXPECT_THAT(staple(), CouldNotBeWritten(bundle));
    EXPECT_EQ(readFile(ticketPath() + "/inside"), "kept");
}

TEST_F(Bundle, AFifoInTheTicketsPlaceIsNeitherReadNorReplaced) {
    ASSERT_EQ(mkfifo(ticketPath().c_str(), 0600), 0);
    EXPECT_THAT(validate(), Ended(65, Contains("Sample.app does not have a ticket stapled to it.")));
    EXPECT_THAT(staple(), CouldNotBeWritten(bundle));
    EXPECT_TRUE(std::filesystem::is_fifo(ticketPath()));
}

TEST_F(Bundle, AFlatBundleHasNoPlaceForATicket) {
    const std::string flat = directory / "builds/Flat.app";
    std::filesystem::create_directory(flat);
    std::filesystem::copy_file(bundle + "/Contents/Programs/Sample", flat + "/Flat");
    const std::string place = urlOf(flat + "/Contents/CodeResources");
    EXPECT_THAT(pinwell({"staple", flat}), CouldNotBeWritten(flat));
    EXPECT_THAT(stapleVerbosely(flat),
                Ended(73, Contains(StartsWith("Could not remove existing ticket from " + place +
                                              " because an error occurred. Error "))));
    EXPECT_FALSE(std::filesystem::exists(flat + "/Contents"));
}

TEST_F(Bundle, APlainExecutableHasNoPlaceForATicket) {
    const std::string tool = directory / "builds/tool";
    std::filesystem::copy_file(bundle + "/Contents/Programs/Sample", tool);
    const std::string before = readFile(tool);
    EXPECT_THAT(pinwell({"staple", tool}), CouldNotBeWritten(tool));
    EXPECT_THAT(stapleVerbosely(tool),
                Ended(73, Contains(StartsWith("Could not remove existing ticket from " +
                                              urlOf(tool + "/Contents/CodeResources")))));
    EXPECT_EQ(readFile(tool), before);
}

TEST_F(Bundle, AnExistingTicketThatCannotBeRemovedStays) {
    if (geteuid() == 0) GTEST_SKIP() << "the superuser can remove it";
    const Data older = sealed(payload().signatureTime(1));
    stapleByHand(older);
    ASSERT_EQ(chmod((bundle + "/Contents").c_str(), 0555), 0);
    EXPECT_THAT(
        stapleVerbosely(bundle),
        Ended(73, Contains(StartsWith("Could not remove existing ticket from " + urlOf(ticketPath())))));
    EXPECT_EQ(stapled(), older);
    ASSERT_EQ(chmod((bundle + "/Contents").c_str(), 0755), 0);
}

TEST_F(Bundle, MayHaveANameThatIsNoURLText) {
    const std::string named = directory / "builds/Zw\xc3\xb6lf % #?.app";
    std::filesystem::rename(bundle, named);
    const ProcessResult result = stapleVerbosely(named);
    EXPECT_THAT(result, Ended(0, AllOf(Contains("Processing: " + named), Contains(kWorked))));
    EXPECT_EQ(readFile(named + "/Contents/CodeResources"), base::toString(genuine));
}

TEST_F(Bundle, ItsNameCannotDriveTheTerminal) {
    const std::string named = directory / "builds/\x1b[31m.app";
    std::filesystem::rename(bundle, named);
    EXPECT_THAT(pinwell({"validate", named}),
                Ended(65, ElementsAre("Processing: " + (directory / "builds/\\x1b[31m.app"),
                                      "\\x1b[31m.app does not have a ticket stapled to it.")));
}

}  // namespace
}  // namespace pinwell::test
