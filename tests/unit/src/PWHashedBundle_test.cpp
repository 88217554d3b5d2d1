#include "src/PWHashedFile/PWHashedBundle.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cerrno>
#include <filesystem>

#include "base/bytes.h"
#include "runtime/process.h"
#include "src/messages.h"
#include "support/message_capture.h"
#include "support/test_platform.h"
#include "values/url.h"

namespace pinwell {
namespace {

using base::Data;
using test::MessageCapture;

class Bundle : public testing::Test {
  protected:
    Bundle() {
        test::writeFile(platform.directory / "App.app/Contents/MacOS/App", std::string_view("code"));
        test::writeFile(platform.directory / "new.ticket", std::string_view("NEW TICKET"));
        platform.codeSigning.information.emplace();
        platform.codeSigning.information->unique = Data(20, std::byte{0xAB});
        platform.codeSigning.information->digestAlgorithm = 2;
    }

    std::string ticketPath() const { return platform.directory / "App.app/Contents/CodeResources"; }
    URL ticketURL() const { return platform.directory.url("App.app/Contents/CodeResources"); }
    URL source() const { return platform.directory.url("new.ticket"); }

    test::TestPlatform platform;
    PWHashedBundle bundle{platform.directory.url("App.app"), platform.services()};
};

TEST_F(Bundle, KeepsItsTicketInContentsCodeResources) {
    EXPECT_EQ(bundle.codeResourcesURL(), ticketURL());
}

TEST_F(Bundle, TakesHashAndAlgorithmFromItsCodeSignature) {
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(bundle.cdHash(), Data(20, std::byte{0xAB}));
    EXPECT_EQ(bundle.digestAlgorithm(), 2U);
    EXPECT_EQ(output.text().find("Props are {\n    cdhash = {length = 20, bytes = 0xabababab"), 0U);
}

TEST_F(Bundle, UnsignedHasNoHashAndAlgorithm0) {
    platform.codeSigning.validity = codesign::kUnsigned;
    bundle.setDigestAlgorithm(7);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(bundle.cdHash(), std::nullopt);
    EXPECT_EQ(bundle.digestAlgorithm(), 0U);
    EXPECT_EQ(output.text(), "Props are {\n}\n");
}

TEST_F(Bundle, WithoutATicketFileHasNoTicketAndPrintsNothing) {
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(bundle.ticketData(), std::nullopt);
    EXPECT_EQ(output.text(), "");
}

TEST_F(Bundle, ReadsBackExactlyTheBytesOfTheTicketFile) {
    test::writeFile(ticketPath(), std::string_view("ticket\0bytes\n", 13));
    EXPECT_EQ(bundle.ticketData(), base::toData(std::string_view("ticket\0bytes\n", 13)));
}

TEST_F(Bundle, TakesNoTicketFromASymbolicLink) {
    std::filesystem::create_symlink(platform.directory / "new.ticket", ticketPath());
    EXPECT_EQ(bundle.ticketData(), std::nullopt);
}

TEST_F(Bundle, TakesNoTicketFromADirectory) {
    std::filesystem::create_directory(ticketPath());
    EXPECT_EQ(bundle.ticketData(), std::nullopt);
}

TEST_F(Bundle, AnUnreadableTicketFileIsNoTicket) {
    test::writeFile(ticketPath(), std::string_view("ticket"));
    platform.files.fail("contentsOfFile", EIO);
    EXPECT_EQ(bundle.ticketData(), std::nullopt);
}

TEST_F(Bundle, StapledForTheFirstTimeHoldsTheSourceBytes) {
    std::optional<Error> error;
    bundle.setAppropriateExitCode(66);
    EXPECT_TRUE(bundle.writeNewTicketDataFromURL(source(), &error));
    EXPECT_EQ(test::readFile(ticketPath()), "NEW TICKET");
    EXPECT_EQ(bundle.appropriateExitCode(), 0);
    EXPECT_FALSE(error.has_value());
}

TEST_F(Bundle, StapledFromAPrivateFileHoldsATicketThatOthersMayRead) {
    std::filesystem::permissions(source().path(), std::filesystem::perms::owner_read);
    const mode_t saved = umask(022);
    EXPECT_TRUE(bundle.writeNewTicketDataFromURL(source(), nullptr));
    umask(saved);
    struct stat status {};
    ASSERT_EQ(stat(ticketPath().c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, 0644U);
}

TEST_F(Bundle, RestapledHoldsTheNewTicketAlone) {
    test::writeFile(ticketPath(), std::string_view("AN OLDER AND MUCH LONGER TICKET"));
    EXPECT_TRUE(bundle.writeNewTicketDataFromURL(source(), nullptr));
    EXPECT_EQ(test::readFile(ticketPath()), "NEW TICKET");
    EXPECT_EQ(bundle.appropriateExitCode(), 0);
}

TEST_F(Bundle, IsWrittenStraightAndNeverThroughTheDriver) {
    bundle.writeNewTicketDataFromURL(source(), nullptr);
    EXPECT_EQ(platform.files.count("volumeSupportsCloning"), 0U);
    EXPECT_EQ(platform.files.count("replaceItem"), 0U);
}

TEST_F(Bundle, NeverReplacesACompatibilityLink) {
    std::filesystem::create_symlink("elsewhere", ticketPath());
    std::optional<Error> error = Error::osStatus(1);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_FALSE(bundle.writeNewTicketDataFromURL(source(), &error));
    EXPECT_EQ(output.text(), runtime::processName() + " will not replace the compatibility symlink at " +
                                 ticketURL().absoluteString() + ". Please remove it manually\n");
    EXPECT_EQ(bundle.appropriateExitCode(), 73);
    EXPECT_FALSE(error.has_value());
    EXPECT_EQ(std::filesystem::read_symlink(ticketPath()), "elsewhere");
}

TEST_F(Bundle, NeverReplacesADirectoryInTheTicketsPlaceWhichItTakesForALink) {
    test::writeFile(ticketPath() + "/inside", std::string_view("kept"));
    std::optional<Error> error = Error::osStatus(1);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_FALSE(bundle.writeNewTicketDataFromURL(source(), &error));
    EXPECT_EQ(output.text(), runtime::processName() + " will not replace the compatibility symlink at " +
                                 ticketURL().absoluteString() + ". Please remove it manually\n");
    EXPECT_EQ(bundle.appropriateExitCode(), 73);
    EXPECT_FALSE(error.has_value());
    EXPECT_EQ(test::readFile(ticketPath() + "/inside"), "kept");
}

TEST_F(Bundle, WithoutAContentsDirectoryFailsAtTheRemoval) {
    test::writeFile(platform.directory / "tool", std::string_view("flat"));
    PWHashedBundle flat{platform.directory.url("tool"), platform.services()};
    EXPECT_EQ(flat.ticketData(), std::nullopt);
    std::optional<Error> error;
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_FALSE(flat.writeNewTicketDataFromURL(source(), &error));
    EXPECT_EQ(output.lines().size(), 1U);
    EXPECT_EQ(output.text().find("Could not remove existing ticket from file://"), 0U);
    EXPECT_NE(output.text().find("/tool/Contents/CodeResources because an error occurred. Error Domain="),
              std::string::npos);
    EXPECT_EQ(flat.appropriateExitCode(), 73);
    EXPECT_TRUE(error.has_value());
}

TEST_F(Bundle, AnOldTicketThatCannotBeRemovedStays) {
    test::writeFile(ticketPath(), std::string_view("OLD"));
    platform.files.fail("copyContents", EIO);
    platform.files.fail("removeItem", EACCES);
    std::optional<Error> error;
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_FALSE(bundle.writeNewTicketDataFromURL(source(), &error));
    EXPECT_EQ(output.text().find("Could not remove existing ticket from " + ticketURL().absoluteString() +
                                 " because an error occurred. Error Domain=POSIXErrorDomain Code=13 "),
              0U);
    EXPECT_EQ(bundle.appropriateExitCode(), 73);
    EXPECT_EQ(error->code(), EACCES);
    EXPECT_EQ(test::readFile(ticketPath()), "OLD");
}

TEST_F(Bundle, ASecondCopyThatFailsLeavesNoTicket) {
    test::writeFile(ticketPath(), std::string_view("OLD"));
    platform.files.fail("copyContents", ENOSPC);
    std::optional<Error> error;
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_FALSE(bundle.writeNewTicketDataFromURL(source(), &error));
    EXPECT_EQ(output.text().find("Could not save ticket to " + ticketURL().absoluteString() +
                                 " because an error occurred. Error Domain=POSIXErrorDomain Code=28 "),
              0U);
    EXPECT_EQ(bundle.appropriateExitCode(), 73);
    EXPECT_EQ(error->code(), ENOSPC);
    EXPECT_FALSE(std::filesystem::exists(ticketPath()));
}

TEST_F(Bundle, DeletingMovesTheTicketToTheTrashAndSaysWhere) {
    test::writeFile(ticketPath(), std::string_view("OLD"));
    bundle.setAppropriateExitCode(42);
    platform.files.answerTrash(platform.directory.url("trash/CodeResources"));
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_TRUE(bundle._deleteExistingTicket());
    EXPECT_EQ(output.lines(),
              std::vector<std::string>{"Successfully moved ticket to trash. Find it at " +
                                       platform.directory.url("trash/CodeResources").absoluteString()});
}

TEST_F(Bundle, DeletingLeavesNoTicketAndTheCodeAsItWas) {
    test::writeFile(ticketPath(), std::string_view("OLD"));
    bundle.setAppropriateExitCode(42);
    EXPECT_TRUE(bundle._deleteExistingTicket());
    EXPECT_FALSE(std::filesystem::exists(ticketPath()));
    EXPECT_EQ(bundle.appropriateExitCode(), 42);
}

TEST_F(Bundle, DeletingATicketThatCannotBeTrashedFailsAndKeepsIt) {
    test::writeFile(ticketPath(), std::string_view("OLD"));
    platform.files.fail("trashItem", EPERM);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_FALSE(bundle._deleteExistingTicket());
    EXPECT_EQ(output.text().find("Could not delete ticket " + ticketURL().absoluteString() +
                                 ". Error Domain=POSIXErrorDomain Code=1 "),
              0U);
    EXPECT_EQ(test::readFile(ticketPath()), "OLD");
}

TEST_F(Bundle, DeletingThroughTheBaseRaisesSinceNoWriteHookIsOverridden) {
    test::writeFile(ticketPath(), std::string_view("OLD"));
    try {
        static_cast<PWHashedFile&>(bundle)._deleteExistingTicket(nullptr);
        FAIL() << "nothing was raised";
    } catch (const InternalInconsistency& raised) {
        EXPECT_STREQ(raised.what(),
                     "You must override _writeNewTicketDataFromURL:intoURL:deleteExisting:error: in the "
                     "PWHashedBundle subclass");
    }
    EXPECT_EQ(test::readFile(ticketPath()), "OLD");
}

// A bundle with directories that are, or become, links into another one.
class LinkedBundle : public Bundle {
  protected:
    LinkedBundle() {
        test::writeFile(otherTicket(), std::string_view("THE OTHER'S TICKET"));
        test::writeFile(platform.directory / "Other.app/Contents/MacOS/App", std::string_view("other"));
        found.emplace(platform.directory.url("App.app"), platform.services());
    }

    std::string contents() const { return platform.directory / "App.app/Contents"; }
    std::string otherTicket() const { return platform.directory / "Other.app/Contents/CodeResources"; }

    void linkContents(const std::string& target) const {
        std::filesystem::rename(contents(), platform.directory / "App.app/Moved");
        std::filesystem::create_directory_symlink(target, contents());
    }

    // Fails with the message about an existing ticket, and leaves the other bundle unchanged.
    void expectNothingIsWritten() {
        std::optional<Error> error;
        const MessageCapture output(kVerbosityVerbose);
        EXPECT_FALSE(found->writeNewTicketDataFromURL(source(), &error));
        EXPECT_EQ(output.text().find("Could not remove existing ticket from " + ticketURL().absoluteString() +
                                     " because an error occurred. "),
                  0U)
            << output.text();
        EXPECT_EQ(found->appropriateExitCode(), 73);
        ASSERT_TRUE(error.has_value());
        EXPECT_EQ(error->code(), EXDEV);
        EXPECT_EQ(test::readFile(otherTicket()), "THE OTHER'S TICKET");
    }

    // A later object of the same path.
    PWHashedBundle again() { return {platform.directory.url("App.app"), platform.services()}; }

    std::optional<PWHashedBundle> found;  // made after the bundle, which it keeps open
};

TEST_F(LinkedBundle, HasNoTicketThroughALinkThatLeadsOut) {
    for (const std::string& target :
         {std::string("../Other.app/Contents"), platform.directory / "Other.app/Contents"}) {
        linkContents(target);
        EXPECT_EQ(again().ticketData(), std::nullopt) << target;
        std::filesystem::remove(contents());
        std::filesystem::rename(platform.directory / "App.app/Moved", contents());
    }
}

TEST_F(LinkedBundle, IsNotWrittenThroughALinkThatLeadsOut) {
    linkContents("../Other.app/Contents");
    expectNothingIsWritten();
}

TEST_F(LinkedBundle, IsNotWrittenThroughALinkThatTakesTheDirectorysPlaceMeanwhile) {
    EXPECT_TRUE(found->cdHash());
    EXPECT_EQ(found->ticketData(), std::nullopt);
    linkContents(platform.directory / "Other.app/Contents");
    expectNothingIsWritten();
}

TEST_F(LinkedBundle, IsWrittenThroughALinkThatStaysInIt) {
    linkContents("Moved");
    EXPECT_TRUE(found->writeNewTicketDataFromURL(source(), nullptr));
    EXPECT_EQ(test::readFile(platform.directory / "App.app/Moved/CodeResources"), "NEW TICKET");
}

TEST_F(LinkedBundle, IsWrittenAsItWasFoundWhenAnotherTakesItsPlaceMeanwhile) {
    std::filesystem::rename(platform.directory / "App.app", platform.directory / "Found.app");
    std::filesystem::rename(platform.directory / "Other.app", platform.directory / "App.app");
    EXPECT_TRUE(found->writeNewTicketDataFromURL(source(), nullptr));
    EXPECT_EQ(test::readFile(platform.directory / "Found.app/Contents/CodeResources"), "NEW TICKET");
    EXPECT_EQ(test::readFile(ticketPath()), "THE OTHER'S TICKET");

    // A reader during its life sees the written ticket.
    EXPECT_EQ(again().ticketData(), base::toData(std::string_view("NEW TICKET")));
}

}  // namespace
}  // namespace pinwell
