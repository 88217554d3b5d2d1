// Stapling and unstapling packages.
#include <gmock/gmock.h>

#include <filesystem>

#include "formats/package_trailers.h"
#include "formats/tm_ticket.h"
#include "package_fixture.h"
#include "support/archive_builder.h"
#include "values/url.h"

namespace pinwell {
namespace {

using base::toData;
using test::MessageCapture;
using test::PackageBuilder;
using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::StartsWith;

class FlatPackageWriting : public test::FlatPackageTest {
  protected:
    FlatPackageWriting() {
        newTicket("NEW TICKET");
        platform.files.answerCloning(false);
        platform.files.answerTemporaryDirectory(values::URL::fileURLWithPath(temporary.path()));
    }

    void newTicket(std::string_view bytes) { test::writeFile(source.path(), bytes); }
    bool staple(ErrorOut error = nullptr) { return package.writeNewTicketDataFromURL(source, error); }
    bool unstaple(ErrorOut error = nullptr) { return package._deleteExistingTicket(error); }

    /// Only the hook, in place: it returns the error that the driver keeps.
    bool write(std::optional<Error>& error) {
        return package._writeNewTicketDataFromURL(source, url, false, &error);
    }

    const values::URL source = platform.directory.url("new.ticket");
    const test::TemporaryDirectory temporary;
};

TEST_F(FlatPackageWriting, TheFirstStapleAppendsTerminatorTicketAndRecord) {
    put(PackageBuilder());
    package.setAppropriateExitCode(66);
    EXPECT_TRUE(staple());
    EXPECT_EQ(contents(), PackageBuilder().terminator().ticket("NEW TICKET").build());
    EXPECT_EQ(package.appropriateExitCode(), 0);
    EXPECT_EQ(package.ticketStart(), PackageBuilder().archiveSize() + 16);
}

TEST_F(FlatPackageWriting, TrailersOfAnyLengthMoveInFrontOfTheNewTicket) {
    const std::string large(std::size_t{20} * 1024 * 1024, 'x');
    put(PackageBuilder().terminator().ticket("OLD").unknown(large).unknown("one"));
    EXPECT_TRUE(staple());
    EXPECT_TRUE(contents() ==
                PackageBuilder().terminator().unknown(large).unknown("one").ticket("NEW TICKET").build());
}

TEST_F(FlatPackageWriting, AStaleTicketOfAnyLengthIsReplaced) {
    put(PackageBuilder().terminator().ticket(std::string(kLongestTicketHeld + 1, 'x')).unknown("one"));
    EXPECT_TRUE(staple());
    EXPECT_TRUE(contents() == PackageBuilder().terminator().unknown("one").ticket("NEW TICKET").build());
}

TEST_F(FlatPackageWriting, AStaleTicketOfAnyLengthIsDeleted) {
    put(PackageBuilder().terminator().ticket(std::string(kLongestTicketHeld + 1, 'x')));
    EXPECT_TRUE(unstaple());
    EXPECT_TRUE(contents() == PackageBuilder().terminator().build());
}

TEST_F(FlatPackageWriting, AnEmptyFileIsStapledLikeAnyOther) {
    put("");
    EXPECT_TRUE(staple());
    EXPECT_EQ(contents(), PackageBuilder().archive({}).terminator().ticket("NEW TICKET").build());
}

TEST_F(FlatPackageWriting, AShorterTicketTakesTheOldOnesPlaceAndTheFileShrinks) {
    const std::string old = PackageBuilder().terminator().ticket("A MUCH LONGER OLD TICKET").build();
    put(old);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_TRUE(staple());
    EXPECT_EQ(contents(), PackageBuilder().terminator().ticket("NEW TICKET").build());
    EXPECT_EQ(output.lines().back(), "Truncating Sample.pkg from to " + std::to_string(old.size()) +
                                         " bytes to " + std::to_string(contents().size()) + " bytes.");
}

TEST_F(FlatPackageWriting, ALongerTicketTakesTheOldOnesPlaceAndTheFileGrows) {
    put(PackageBuilder().terminator().ticket("OLD"));
    EXPECT_TRUE(staple());
    EXPECT_EQ(contents(), PackageBuilder().terminator().ticket("NEW TICKET").build());
    EXPECT_EQ(platform.files.count("handle.truncate"), 0U);
}

TEST_F(FlatPackageWriting, ATicketOfTheSameLengthLeavesTheFilesLength) {
    put(PackageBuilder().terminator().ticket("OLD TICKET"));
    EXPECT_TRUE(staple());
    EXPECT_EQ(contents(), PackageBuilder().terminator().ticket("NEW TICKET").build());
    EXPECT_EQ(platform.files.count("handle.truncate"), 0U);
}

TEST_F(FlatPackageWriting, AFreshObjectReadsTheTicketBack) {
    put(PackageBuilder());
    staple();
    PWHashedFlatPackage fresh{url, platform.services()};
    EXPECT_EQ(fresh.ticketData(), toData("NEW TICKET"));
    EXPECT_EQ(package.ticketData(), std::nullopt) << "the first answer stays";
}

TEST_F(FlatPackageWriting, AnUnknownTrailerAfterTheTicketMovesBeforeTheNewOne) {
    put(PackageBuilder().terminator().ticket("OLD").unknown("one").unknown("two", 9));
    EXPECT_TRUE(staple());
    EXPECT_EQ(contents(),
              PackageBuilder().terminator().unknown("one").unknown("two", 9).ticket("NEW TICKET").build());
}

TEST_F(FlatPackageWriting, AnUnknownTrailerBetweenTerminatorAndTicketStaysWhereItIs) {
    put(PackageBuilder().terminator().unknown("one").ticket("OLD"));
    EXPECT_TRUE(staple());
    EXPECT_EQ(contents(), PackageBuilder().terminator().unknown("one").ticket("NEW TICKET").build());
}

TEST_F(FlatPackageWriting, RestapledWithUnknownTrailersOnBothSidesKeepsBoth) {
    put(PackageBuilder().terminator().unknown("one").ticket("OLD").unknown("two"));
    EXPECT_TRUE(staple());
    EXPECT_EQ(contents(),
              PackageBuilder().terminator().unknown("one").unknown("two").ticket("NEW TICKET").build());
}

TEST_F(FlatPackageWriting, AChainWithATerminatorButNoTicketIsWrittenFromOffset0) {
    const std::string old = PackageBuilder().terminator().build();
    put(old);
    EXPECT_TRUE(staple());
    EXPECT_EQ(contents(), PackageBuilder().archive({}).ticket("NEW TICKET").build());
    EXPECT_LT(contents().size(), old.size());
    EXPECT_EQ(package.appropriateExitCode(), 0);
}

TEST_F(FlatPackageWriting, AChainOfUnknownTrailersAloneIsWrittenFromOffset0AsWell) {
    put(PackageBuilder().terminator().unknown("one"));
    EXPECT_TRUE(staple());
    EXPECT_EQ(contents(), PackageBuilder().archive({}).unknown("one").ticket("NEW TICKET").build());
}

// A ticket at offset 0, without a terminator, does not look like a chain: a new chain begins after it.
TEST_F(FlatPackageWriting, ATicketAtTheStartOfTheFileStaysAndAChainBeginsAfterIt) {
    const PackageBuilder ticketAlone = PackageBuilder().archive({}).ticket("OLD");
    put(ticketAlone);
    EXPECT_TRUE(staple());
    EXPECT_EQ(contents(), PackageBuilder(ticketAlone).terminator().ticket("NEW TICKET").build());
    EXPECT_EQ(package.appropriateExitCode(), 0);
}

TEST_F(FlatPackageWriting, DeletingATicketAtTheStartOfTheFileEndsTheChainAfterIt) {
    const PackageBuilder ticketAlone = PackageBuilder().archive({}).ticket("OLD");
    put(ticketAlone);
    EXPECT_TRUE(unstaple());
    EXPECT_EQ(contents(), PackageBuilder(ticketAlone).terminator().build());
    PWHashedFlatPackage fresh{url, platform.services()};
    EXPECT_EQ(fresh.ticketData(), std::nullopt);
}

// Its place is kept, and the next ticket takes it.
TEST_F(FlatPackageWriting, ATicketRecordWithoutDataIsReplaced) {
    put(PackageBuilder().terminator().ticket(""));
    EXPECT_TRUE(staple());
    EXPECT_EQ(contents(), PackageBuilder().terminator().ticket("NEW TICKET").build());
}

TEST_F(FlatPackageWriting, WhereTheVolumeClonesTheNewFileIsSwappedIn) {
    platform.files.answerCloning(true);
    put(PackageBuilder());
    std::optional<Error> error = Error::osStatus(1);
    EXPECT_TRUE(staple(&error));
    EXPECT_EQ(contents(), PackageBuilder().terminator().ticket("NEW TICKET").build());
    EXPECT_EQ(platform.files.count("replaceItem"), 1U);
    EXPECT_FALSE(error.has_value());
}

TEST_F(FlatPackageWriting, WhereTheVolumeClonesAFailedWriteLeavesThePackageAlone) {
    platform.files.answerCloning(true);
    put(PackageBuilder());
    platform.files.fail("handle.write", ENOSPC);
    EXPECT_FALSE(staple());
    EXPECT_EQ(contents(), PackageBuilder().build());
    EXPECT_EQ(package.appropriateExitCode(), 73);
    EXPECT_EQ(platform.files.count("replaceItem"), 0U);
}

TEST_F(FlatPackageWriting, ATicketFileThatCannotBeReadIsRefusedWithItsError) {
    put(PackageBuilder());
    std::filesystem::remove(source.path());
    std::optional<Error> error;
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_FALSE(write(error));
    EXPECT_THAT(output.lines(),
                ElementsAre(StartsWith("Cannot add a new ticket to Sample.pkg. Error Domain=")));
    EXPECT_EQ(package.appropriateExitCode(), 73);
    EXPECT_EQ(error->code(), ENOENT);
    EXPECT_EQ(contents(), PackageBuilder().build());
}

TEST_F(FlatPackageWriting, AnEmptyTicketFileIsRefusedWithoutAnError) {
    put(PackageBuilder());
    newTicket("");
    std::optional<Error> error = Error::osStatus(1);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_FALSE(write(error));
    EXPECT_EQ(output.text(), "Cannot add a new ticket to Sample.pkg. (null)\n");
    EXPECT_EQ(package.appropriateExitCode(), 73);
    EXPECT_FALSE(error.has_value());
}

TEST_F(FlatPackageWriting, NoTicketFileAtAllIsRefused) {
    put(PackageBuilder());
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_FALSE(package._writeNewTicketDataFromURL(std::nullopt, url, false, nullptr));
    EXPECT_EQ(output.text(), "Cannot add a new ticket to Sample.pkg. (null)\n");
    EXPECT_EQ(package.appropriateExitCode(), 73);
    EXPECT_EQ(platform.files.count("openForReading"), 0U) << "refused before the trailers are looked at";
}

TEST_F(FlatPackageWriting, NamesTheTargetThatItWritesAndNotTheFileThatWasRead) {
    put(PackageBuilder().terminator().ticket("A MUCH LONGER OLD TICKET"));
    const values::URL clone = platform.directory.url("Clone.pkg");
    std::filesystem::copy_file(path, clone.path());
    const auto saidOf = [&](const std::optional<values::URL>& from, bool deleteExisting) {
        const MessageCapture output(kVerbosityVerbose);
        package._writeNewTicketDataFromURL(from, clone, deleteExisting, nullptr);
        return output.lines().back();
    };
    EXPECT_EQ(saidOf(std::nullopt, false), "Cannot add a new ticket to Clone.pkg. (null)");
    EXPECT_THAT(saidOf(source, false), StartsWith("Truncating Clone.pkg from to "));
    platform.files.fail("handle.write", EIO);
    EXPECT_THAT(saidOf(source, false),
                StartsWith("Fatal error while writing new ticket to " + clone.path() + ". "));
    platform.files.fail("openForUpdating", EACCES);
    EXPECT_THAT(saidOf(source, false), StartsWith("Could not create file handle to " + clone.path() + ". "));

    put(PackageBuilder());
    PWHashedFlatPackage bare(url, platform.services());
    const MessageCapture output(kVerbosityVerbose);
    bare._writeNewTicketDataFromURL(std::nullopt, clone, true, nullptr);
    EXPECT_EQ(output.lines().back(), "Cannot delete an existing ticket in Clone.pkg that doesn't exist.");
}

TEST_F(FlatPackageWriting, ATargetThatCannotBeOpenedIsReportedWithItsError) {
    put(PackageBuilder());
    platform.files.fail("openForUpdating", EACCES);
    std::optional<Error> error;
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_FALSE(write(error));
    EXPECT_THAT(output.lines().back(),
                StartsWith("Could not create file handle to " + path + ". Error Domain="));
    EXPECT_EQ(package.appropriateExitCode(), 73);
    EXPECT_EQ(error->code(), EACCES);
}

TEST_F(FlatPackageWriting, EveryStepThatFailsIsAFatalErrorWith73AndWithoutAnErrorToHandOut) {
    for (const char* step : {"handle.seek", "handle.write", "handle.position", "handle.truncate",
                             "handle.synchronize", "handle.close"}) {
        put(PackageBuilder().terminator().ticket("A MUCH LONGER OLD TICKET").unknown("one"));
        PWHashedFlatPackage file{url, platform.services()};
        ASSERT_TRUE(file.ticketData().has_value());
        platform.files.fail(step, EIO);
        std::optional<Error> error = Error::osStatus(1);
        const MessageCapture output(kVerbosityVerbose);
        EXPECT_FALSE(file._writeNewTicketDataFromURL(source, url, false, &error)) << step;
        EXPECT_THAT(output.lines().back(),
                    StartsWith("Fatal error while writing new ticket to " + path + ". Cannot "))
            << step;
        EXPECT_EQ(file.appropriateExitCode(), 73) << step;
        EXPECT_FALSE(error.has_value()) << step;
        platform.files.fail(step, 0);
    }
}

// Fails each handle operation of a first staple in turn, until none fails any more.
TEST_F(FlatPackageWriting, AFirstStapleThatFailsAtAnyOperationEndsWith73OrSucceedsWhole) {
    bool succeeded = false;
    for (std::size_t n = 0; !succeeded; ++n) {
        ASSERT_LT(n, 20U);
        put(PackageBuilder());
        PWHashedFlatPackage file{url, platform.services()};
        file.ticketData();
        const std::size_t opened = platform.files.operations().size() + 2;  // after the read of the ticket
        platform.files.failOperation(opened + n, EIO);
        std::string lastLine;
        {
            const MessageCapture output(kVerbosityVerbose);
            succeeded = file._writeNewTicketDataFromURL(source, url, false, nullptr);
            if (!succeeded) lastLine = output.lines().back();
        }
        if (succeeded) {
            EXPECT_EQ(contents(), PackageBuilder().terminator().ticket("NEW TICKET").build());
            EXPECT_EQ(n, 9U) << "seekToEnd, reserve, seek, write, position, seek, write, synchronize, close";
        } else {
            EXPECT_EQ(file.appropriateExitCode(), 73) << n;
            EXPECT_THAT(lastLine, StartsWith("Fatal error while writing new ticket to ")) << n;
        }
    }
}

// A chain with trailers but without a ticket is overwritten from the file's first byte on. Whatever operation
// is the last to succeed, the remaining file must not look like such a chain.
TEST_F(FlatPackageWriting, CutShortAnywhereLeavesAFileThatCanBeStapledAgain) {
    const PackageBuilder unstapled;
    const PackageBuilder followed = PackageBuilder().terminator().ticket("AN OLD TICKET").unknown("unknown");
    for (const PackageBuilder& before : {unstapled, followed}) {
        bool succeeded = false;
        for (std::size_t n = 0; !succeeded; ++n) {
            ASSERT_LT(n, 20U);
            put(before);
            test::TestPlatform failing;
            failing.files.answerCloning(false);
            failing.files.answerTemporaryDirectory(values::URL::fileURLWithPath(temporary.path()));
            PWHashedFlatPackage file{url, failing.services()};
            file.ticketData();
            // After the check for cloning and the read of the ticket.
            const std::size_t opened = failing.files.operations().size() + 4;
            for (std::size_t i = n; i < 20; ++i) failing.files.failOperation(opened + i, EIO);
            const MessageCapture output(kVerbosityQuiet);
            succeeded = file.writeNewTicketDataFromURL(source, nullptr);

            PWHashedFlatPackage again{url, platform.services()};
            EXPECT_TRUE(again.writeNewTicketDataFromURL(source, nullptr)) << n;
            EXPECT_TRUE(contents().starts_with(unstapled.build())) << n;
            EXPECT_EQ(PWHashedFlatPackage(url, platform.services()).ticketData(), toData("NEW TICKET")) << n;
        }
    }
}

TEST_F(FlatPackageWriting, TrailersThatMoveAreSavedUntilTheyAreWritten) {
    const PackageBuilder before = PackageBuilder().terminator().ticket("OLD").unknown("one");
    put(before);
    package.ticketData();
    platform.files.fail("handle.write", EIO);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_FALSE(staple());

    const std::size_t belongsAt = PackageBuilder().archiveSize();
    std::vector<std::string> copies;
    for (const auto& entry : std::filesystem::directory_iterator(temporary.path()))
        copies.push_back(entry.path());
    ASSERT_EQ(copies.size(), 1U);
    EXPECT_TRUE(copies.front().ends_with("." + std::to_string(belongsAt) + ".pkgTrailers"));
    EXPECT_EQ(test::readFile(copies.front()),
              PackageBuilder().archive({}).terminator().unknown("one").ticket("NEW TICKET").build());
    EXPECT_THAT(output.lines(), Contains("The trailers of Sample.pkg are kept in " + copies.front() + "."));
}

TEST_F(FlatPackageWriting, TheSavedTrailersAreGoneWhenAllIsWritten) {
    put(PackageBuilder().terminator().ticket("OLD").unknown("one"));
    EXPECT_TRUE(staple());
    EXPECT_EQ(platform.files.count("writeFile"), 1U);
    EXPECT_TRUE(std::filesystem::is_empty(temporary.path()));
}

TEST_F(FlatPackageWriting, NothingIsSavedWhereNoTrailerMoves) {
    put(PackageBuilder().terminator().unknown("one").ticket("OLD"));
    EXPECT_TRUE(staple());
    EXPECT_EQ(platform.files.count("writeFile"), 0U);
}

TEST_F(FlatPackageWriting, NothingIsSavedWhereACloneIsWritten) {
    const std::string before = PackageBuilder().terminator().ticket("OLD").unknown("one").build();
    put(before);
    const values::URL clone = platform.directory.url("clone.pkg");
    test::writeFile(clone.path(), before);
    package.ticketData();
    EXPECT_TRUE(package._writeNewTicketDataFromURL(source, clone, false, nullptr));
    EXPECT_EQ(platform.files.count("writeFile"), 0U);
    EXPECT_EQ(test::readFile(clone.path()),
              PackageBuilder().terminator().unknown("one").ticket("NEW TICKET").build());
    EXPECT_EQ(contents(), before);
}

TEST_F(FlatPackageWriting, TrailersThatCannotBeSavedAreMovedAllTheSame) {
    put(PackageBuilder().terminator().ticket("OLD").unknown("one"));
    platform.files.fail("writeFile", ENOSPC);
    EXPECT_TRUE(staple());
    EXPECT_EQ(contents(), PackageBuilder().terminator().unknown("one").ticket("NEW TICKET").build());
    EXPECT_EQ(package.appropriateExitCode(), 0);
}

TEST_F(FlatPackageWriting, TrailersMoveThoughTheRecordInFrontOfThemCannotBeReadForTheCopy) {
    put(PackageBuilder().terminator().ticket("OLD").unknown("one"));
    package.ticketData();
    platform.files.fail("handle.read", EIO);
    EXPECT_TRUE(staple());
    EXPECT_EQ(platform.files.count("writeFile"), 0U);
    EXPECT_EQ(contents(), PackageBuilder().terminator().unknown("one").ticket("NEW TICKET").build());
}

TEST_F(FlatPackageWriting, DeletingRemovesTheTicketAndLeavesTheTerminator) {
    put(PackageBuilder().terminator().ticket("OLD"));
    package.setAppropriateExitCode(66);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_TRUE(unstaple());
    EXPECT_EQ(contents(), PackageBuilder().terminator().build());
    EXPECT_EQ(package.appropriateExitCode(), 0);
    EXPECT_EQ(output.lines().front(),
              "Attempting to delete the existing ticket attatched Sample.pkg. Let's see how that works out.");
}

TEST_F(FlatPackageWriting, DeletingKeepsTheUnknownTrailersOnBothSides) {
    put(PackageBuilder().terminator().unknown("one").ticket("OLD").unknown("two"));
    EXPECT_TRUE(unstaple());
    EXPECT_EQ(contents(), PackageBuilder().terminator().unknown("one").unknown("two").build());
}

TEST_F(FlatPackageWriting, DeletingWhereTheVolumeClonesSwapsTheCloneIn) {
    platform.files.answerCloning(true);
    put(PackageBuilder().terminator().ticket("OLD"));
    EXPECT_TRUE(unstaple());
    EXPECT_EQ(contents(), PackageBuilder().terminator().build());
    EXPECT_EQ(platform.files.count("replaceItem"), 1U);
}

TEST_F(FlatPackageWriting, DeletingATicketThatIsNotThereFailsAndLeavesTheFileUntouched) {
    for (const PackageBuilder& ticketless :
         {PackageBuilder(), PackageBuilder().terminator().unknown("one")}) {
        put(ticketless);
        PWHashedFlatPackage file{url, platform.services()};
        std::optional<Error> error = Error::osStatus(1);
        const MessageCapture output(kVerbosityVerbose);
        EXPECT_FALSE(file._writeNewTicketDataFromURL(std::nullopt, url, true, &error));
        EXPECT_EQ(output.lines().back(),
                  "Cannot delete an existing ticket in Sample.pkg that doesn't exist.");
        EXPECT_EQ(file.appropriateExitCode(), 73);
        EXPECT_FALSE(error.has_value());
        EXPECT_EQ(contents(), ticketless.build());
    }
    EXPECT_THAT(platform.files.changes(), ElementsAre());
}

TEST_F(FlatPackageWriting, DeletingThroughTheBaseWithoutATicketFailsWith73) {
    put(PackageBuilder());
    EXPECT_FALSE(unstaple());
    EXPECT_EQ(package.appropriateExitCode(), 73);
    EXPECT_EQ(contents(), PackageBuilder().build());
}

TEST_F(FlatPackageWriting, AFailedDeletionReportsThatItWasOne) {
    put(PackageBuilder().terminator().ticket("OLD"));
    platform.files.fail("handle.truncate", EIO);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_FALSE(unstaple());
    EXPECT_THAT(output.lines().back(),
                StartsWith("Fatal error while deleting existing ticket to " + path + ". Cannot truncate "));
    EXPECT_EQ(package.appropriateExitCode(), 73);
}

TEST_F(FlatPackageWriting, TheRestOfADeletionIsStapledFromOffset0) {
    put(PackageBuilder().terminator().ticket("OLD"));
    EXPECT_TRUE(unstaple());
    PWHashedFlatPackage fresh{url, platform.services()};
    EXPECT_TRUE(fresh.writeNewTicketDataFromURL(source, nullptr));
    EXPECT_EQ(contents(), PackageBuilder().archive({}).ticket("NEW TICKET").build());
}

TEST_F(FlatPackageWriting, StapledTwiceIsTheSameAsOnce) {
    put(PackageBuilder());
    staple();
    const std::string once = contents();
    PWHashedFlatPackage fresh{url, platform.services()};
    EXPECT_TRUE(fresh.writeNewTicketDataFromURL(source, nullptr));
    EXPECT_EQ(contents(), once);
}

TEST_F(FlatPackageWriting, TheWholeFileIsFlushedBeforeSuccessIsReported) {
    put(PackageBuilder());
    staple();
    const auto names = platform.files.names();
    ASSERT_GE(names.size(), 2U);
    EXPECT_EQ(names[names.size() - 2], "handle.synchronize");
    EXPECT_EQ(names.back(), "handle.close");
}

}  // namespace
}  // namespace pinwell
