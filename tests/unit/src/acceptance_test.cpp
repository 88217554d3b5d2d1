// The controller's judgement of tickets, the storing of a downloaded one, and the final report.
#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>

#include "src/DownloadDelegate.h"
#include "src/PWHashedFile/PWHashedBundle.h"
#include "support/message_capture.h"
#include "support/test_platform.h"

namespace pinwell {
namespace {

using base::Data;
using test::MessageCapture;
using test::unsignedTicket;

class Acceptance : public testing::Test {
  protected:
    Acceptance() {
        test::writeFile(platform.directory / "App.app/Contents/MacOS/App", std::string_view("code"));
        std::filesystem::create_directory(platform.directory / "tmp");
        setFileHash(hash(0xAB));
        file = std::make_shared<PWHashedBundle>(platform.directory.url("App.app"), platform.services());
        controller = std::make_unique<DownloadDelegate>(file, platform.services());
        controller->setTempFileURL(platform.directory.url("tmp/REQUEST.ticket"));
    }

    static Data hash(unsigned value, std::size_t size = 20) {
        return Data(size, static_cast<std::byte>(value));
    }

    void setFileHash(const Data& value) {
        platform.codeSigning.information.emplace();
        platform.codeSigning.information->unique = value;
        platform.codeSigning.information->digestAlgorithm = 2;
    }

    std::string stapledPath() const { return platform.directory / "App.app/Contents/CodeResources"; }

    test::TestPlatform platform;
    std::shared_ptr<PWHashedFile> file;
    std::unique_ptr<DownloadDelegate> controller;
};

TEST_F(Acceptance, AGenuineTicketThatListsTheFileIsAccepted) {
    EXPECT_TRUE(controller->isValidTicketData(unsignedTicket({hash(0xAB)})));
    EXPECT_EQ(file->appropriateExitCode(), 0);
    EXPECT_FALSE(file->revoked());
}

TEST_F(Acceptance, ADownloadedTicketIsJudgedFromMemoryNotFromTheFileItWasWrittenTo) {
    platform.files.fail("contentsOfFile", EIO);
    controller->setOperation(kOperationValidate);
    controller->writeDownloadedData(unsignedTicket({hash(0xAB)}), nullptr);
    EXPECT_EQ(file->appropriateExitCode(), 0);
}

TEST_F(Acceptance, AMissingTicketIsRefusedWith65AndInSilence) {
    const MessageCapture output(kVerbosityNormal);
    EXPECT_FALSE(controller->isValidTicketData(std::nullopt));
    EXPECT_EQ(file->appropriateExitCode(), 65);
    EXPECT_EQ(output.text(), "");
}

TEST_F(Acceptance, ATicketOfZeroBytesIsRefusedWith65AndInSilence) {
    const MessageCapture output(kVerbosityNormal);
    EXPECT_FALSE(controller->isValidTicketData(Data{}));
    EXPECT_EQ(file->appropriateExitCode(), 65);
    EXPECT_EQ(output.text(), "");
}

TEST_F(Acceptance, ATicketWhoseChainIsNotTrustedIsRefusedWith65) {
    platform.trust.evaluations = {{.verdict = trust::Verdict::recoverableFailure}};
    EXPECT_FALSE(controller->isValidTicketData(unsignedTicket({hash(0xAB)})));
    EXPECT_EQ(file->appropriateExitCode(), 65);
}

TEST_F(Acceptance, ARevokedTicketIsRefusedWith77EvenWhenItListsTheFile) {
    EXPECT_FALSE(controller->isValidTicketData(unsignedTicket({hash(0xAB)}, 1)));
    EXPECT_EQ(file->appropriateExitCode(), 77);
    EXPECT_TRUE(file->revoked());
}

TEST_F(Acceptance, OtherFlagBitsMeanNothing) {
    EXPECT_TRUE(controller->isValidTicketData(unsignedTicket({hash(0xAB)}, 0xFFFFFFFE)));
}

TEST_F(Acceptance, ATicketThatListsOtherHashesOnlyIsRefusedWith65) {
    EXPECT_FALSE(controller->isValidTicketData(unsignedTicket({hash(0xAA), hash(0xAC)})));
    EXPECT_EQ(file->appropriateExitCode(), 65);
}

TEST_F(Acceptance, ATicketWithoutEntriesIsRefusedWith65) {
    EXPECT_FALSE(controller->isValidTicketData(unsignedTicket({})));
    EXPECT_EQ(file->appropriateExitCode(), 65);
}

// Offsets of the first two entries' algorithm bytes in a ticket of unsignedTicket with 20-byte hashes.
constexpr std::size_t kFirstAlgorithm = 16 + 5 + 24;
constexpr std::size_t kSecondAlgorithm = kFirstAlgorithm + 21;

TEST_F(Acceptance, AnEntryOfUnknownAlgorithmDoesNotMatchButALaterOneDoes) {
    Data ticket = unsignedTicket({hash(0xAB)});
    ticket[kFirstAlgorithm] = std::byte{9};
    EXPECT_FALSE(controller->isValidTicketData(ticket));

    ticket = unsignedTicket({hash(0xAB), hash(0xAB)});
    ticket[kFirstAlgorithm] = std::byte{9};
    EXPECT_TRUE(controller->isValidTicketData(ticket));
}

TEST_F(Acceptance, AnyAlgorithmOfTwentyBytesMatchesWhateverTheFilesOwn) {
    for (const unsigned algorithm : {1U, 2U, 3U}) {
        Data ticket = unsignedTicket({hash(0xAA), hash(0xAB)});
        ticket[kSecondAlgorithm] = static_cast<std::byte>(algorithm);
        EXPECT_TRUE(controller->isValidTicketData(ticket)) << algorithm;
    }
}

TEST_F(Acceptance, ATwentyByteHashNeverMatchesAnEntryOfAlgorithm4) {
    Data ticket = unsignedTicket({hash(0xAB, 48)});
    ticket[kFirstAlgorithm] = std::byte{4};
    EXPECT_FALSE(controller->isValidTicketData(ticket));
}

TEST_F(Acceptance, AFortyEightByteHashMatchesAnEntryOfAlgorithm4) {
    setFileHash(hash(0xAB, 48));
    Data ticket = unsignedTicket({hash(0xAB, 48)});
    ticket[kFirstAlgorithm] = std::byte{4};
    EXPECT_TRUE(controller->isValidTicketData(ticket));
}

TEST_F(Acceptance, TheHashIsPrintedWithItsAlgorithm) {
    Data counting;
    for (unsigned i = 1; i <= 20; ++i) counting.push_back(static_cast<std::byte>(i));
    setFileHash(counting);
    file->cdHash();
    EXPECT_EQ(controller->prettyHashString(), "2/0102030405060708090a0b0c0d0e0f1011121314");
}

TEST_F(Acceptance, AMissingHashPrintsAsNothingAfterTheAlgorithm) {
    platform.codeSigning.validity = codesign::kUnsigned;
    EXPECT_EQ(controller->prettyHashString(), "0/");
}

TEST_F(Acceptance, NilDataIsNotSavedAndLeavesTheCode) {
    const MessageCapture output(kVerbosityNormal);
    file->setAppropriateExitCode(42);
    std::optional<Error> error;
    controller->writeDownloadedData(std::nullopt, &error);
    EXPECT_EQ(output.text(), "Could not save data. A parameter was not valid.\n");
    ASSERT_TRUE(error.has_value());
    EXPECT_EQ(error->domain(), "OSStatusErrorDomain");
    EXPECT_EQ(error->code(), -50);
    EXPECT_EQ(file->appropriateExitCode(), 42);
}

TEST_F(Acceptance, ADownloadedTicketIsKeptInTheTemporaryDirectory) {
    controller->setOperation(kOperationValidate);
    const MessageCapture output(kVerbosityVerbose);
    const Data ticket = unsignedTicket({hash(0xAB)});
    controller->writeDownloadedData(ticket, nullptr);
    EXPECT_TRUE(output.contains(values::format("Downloaded ticket has been stored at %@.",
                                               platform.directory.url("tmp/REQUEST.ticket"))));
    EXPECT_EQ(test::readFile(platform.directory / "tmp/REQUEST.ticket"), base::toString(ticket));
    EXPECT_EQ(file->appropriateExitCode(), 0);
}

TEST_F(Acceptance, ValidateDoesNotTouchTheArtefact) {
    controller->setOperation(kOperationValidate);
    controller->writeDownloadedData(unsignedTicket({hash(0xAB)}), nullptr);
    EXPECT_FALSE(std::filesystem::exists(stapledPath()));
}

TEST_F(Acceptance, AnyOperationButStapleDoesNotTouchTheArtefact) {
    for (const std::uint8_t operation : {std::uint8_t{0}, std::uint8_t{7}}) {
        controller->setOperation(operation);
        controller->writeDownloadedData(unsignedTicket({hash(0xAB)}), nullptr);
        EXPECT_FALSE(std::filesystem::exists(stapledPath()));
        EXPECT_EQ(file->appropriateExitCode(), 0);
    }
}

TEST_F(Acceptance, ATicketThatIsKeptLeavesNoErrorWhetherItIsAcceptedOrNot) {
    controller->setOperation(kOperationValidate);
    for (const unsigned listed : {0xABU, 0x01U}) {
        std::optional<Error> error = Error::osStatus(1);
        controller->writeDownloadedData(unsignedTicket({hash(listed)}), &error);
        EXPECT_FALSE(error.has_value());
    }
}

TEST_F(Acceptance, StapleWritesTheTicketIntoTheArtefact) {
    controller->setOperation(kOperationStaple);
    const Data ticket = unsignedTicket({hash(0xAB)});
    controller->writeDownloadedData(ticket, nullptr);
    EXPECT_EQ(test::readFile(stapledPath()), base::toString(ticket));
    EXPECT_EQ(file->appropriateExitCode(), 0);
}

TEST_F(Acceptance, ATemporaryFileThatCannotBeWrittenEndsWith73AfterTheStoredLine) {
    controller->setTempFileURL(platform.directory.url("missing/REQUEST.ticket"));
    const MessageCapture output(kVerbosityVerbose);
    std::optional<Error> error;
    controller->setOperation(kOperationStaple);
    controller->writeDownloadedData(unsignedTicket({hash(0xAB)}), &error);
    ASSERT_EQ(output.lines().size(), 2U);
    EXPECT_EQ(output.lines()[0].find("Downloaded ticket has been stored at file://"), 0U);
    EXPECT_EQ(output.lines()[1].find("Could not write ticket to file://"), 0U);
    EXPECT_NE(output.lines()[1].find("missing/REQUEST.ticket due to Error Domain=POSIXErrorDomain Code=2"),
              std::string::npos);
    EXPECT_EQ(file->appropriateExitCode(), 73);
    EXPECT_TRUE(error.has_value());
    EXPECT_FALSE(std::filesystem::exists(stapledPath()));
}

TEST_F(Acceptance, ARefusedDownloadNamesThePathAndKeepsTheCheckersCode) {
    controller->setOperation(kOperationStaple);
    const MessageCapture output(kVerbosityNormal);
    controller->writeDownloadedData(unsignedTicket({hash(0x01)}), nullptr);
    EXPECT_EQ(output.text(), "Could not validate ticket for " + (platform.directory / "App.app") + "\n");
    EXPECT_EQ(file->appropriateExitCode(), 65);
    EXPECT_FALSE(std::filesystem::exists(stapledPath()));

    controller->writeDownloadedData(unsignedTicket({hash(0xAB)}, 1), nullptr);
    EXPECT_EQ(file->appropriateExitCode(), 77);
}

TEST_F(Acceptance, AFailedStapleLeavesTheWritersCodeAndHandsOutItsError) {
    std::filesystem::create_directory(stapledPath());  // not a regular file: never replaced
    controller->setOperation(kOperationStaple);
    std::optional<Error> error = Error::osStatus(1);
    controller->writeDownloadedData(unsignedTicket({hash(0xAB)}), &error);
    EXPECT_EQ(file->appropriateExitCode(), 73);
    EXPECT_FALSE(error.has_value());  // the refusal to replace it has no error object
}

// A kind whose write returns the test's value, and never sets a code.
struct SilentFile : PWHashedBundle {
    using PWHashedBundle::PWHashedBundle;
    bool writeNewTicketDataFromURL(const URL& source, ErrorOut error) override {
        writtenFrom = source;
        if (error != nullptr) *error = writes ? std::nullopt : std::optional(Error::posix(EROFS));
        return writes;
    }
    bool writes = false;
    std::optional<URL> writtenFrom;
};

TEST_F(Acceptance, AFailedStapleThatSetsNoCodeLeaves0AndHandsOutItsError) {
    const auto silent = std::make_shared<SilentFile>(platform.directory.url("App.app"), platform.services());
    controller->setHashedFile(silent);
    controller->setOperation(kOperationStaple);
    std::optional<Error> error;
    controller->writeDownloadedData(unsignedTicket({hash(0xAB)}), &error);
    EXPECT_EQ(silent->writtenFrom, controller->tempFileURL());
    EXPECT_EQ(silent->appropriateExitCode(), 0);
    EXPECT_EQ(error, Error::posix(EROFS));
}

class Report : public Acceptance {
  protected:
    std::optional<int> report() {
        return platform.exitStatusOf([&] { controller->notifyResult(); });
    }
};

TEST_F(Report, AGoodStapleIsReadBackAndReported) {
    controller->setOperation(kOperationStaple);
    controller->writeDownloadedData(unsignedTicket({hash(0xAB)}), nullptr);
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(report(), 0);
    EXPECT_NE(controller->hashedFile(), file);
    EXPECT_EQ(output.lines(), (std::vector<std::string>{"Processing: " + (platform.directory / "App.app"),
                                                        "The staple and validate action worked!"}));
}

TEST_F(Report, ASwallowedWriteFailureIsFoundWhenReadingBack) {
    controller->setOperation(kOperationStaple);
    file->setAppropriateExitCode(0);  // as a write that failed without saying so leaves it
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(report(), 73);
    EXPECT_EQ(output.lines()[1],
              "Although we wrote the ticket, the written data did not validate. Please restore " +
                  (platform.directory / "App.app") + " from backup to try again.");
    EXPECT_EQ(output.lines()[2], "The staple and validate action failed! Error 73.");
}

TEST_F(Report, AFailedStapleThatSetsNoCodeIsFoundWhenReadingBack) {
    controller->setHashedFile(
        std::make_shared<SilentFile>(platform.directory.url("App.app"), platform.services()));
    controller->setOperation(kOperationStaple);
    controller->writeDownloadedData(unsignedTicket({hash(0xAB)}), nullptr);
    EXPECT_EQ(report(), 73);
}

TEST_F(Report, AStapledTicketThatReadsBackRevokedIsReportedAsBothAndEndsWith73) {
    controller->setOperation(kOperationStaple);
    file->setAppropriateExitCode(0);
    test::writeFile(stapledPath(), base::ByteView(unsignedTicket({hash(0xAB)}, 1)));
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(report(), 73);
    ASSERT_EQ(output.lines().size(), 3U);
    EXPECT_EQ(output.lines()[1],
              "Although we wrote the ticket, the written data did not validate. Please restore " +
                  (platform.directory / "App.app") + " from backup to try again.");
    EXPECT_EQ(output.lines()[2],
              "The ticket for App.app has been revoked. Tollmark will prevent it from running.");
}

TEST_F(Report, AnArtefactThatVanishedAfterTheStapleEndsWith73) {
    controller->setOperation(kOperationStaple);
    file->setAppropriateExitCode(0);
    std::filesystem::remove_all(platform.directory / "App.app");
    EXPECT_EQ(report(), 73);
}

TEST_F(Report, AnArtefactThatTurnedIntoSomethingElseEndsWith73) {
    controller->setOperation(kOperationStaple);
    file->setAppropriateExitCode(0);
    std::filesystem::remove_all(platform.directory / "App.app");
    test::writeFile(platform.directory / "App.app", std::string_view("text"));
    EXPECT_EQ(report(), 73);
}

TEST_F(Report, AFailedStapleIsNotReadBack) {
    controller->setOperation(kOperationStaple);
    file->setAppropriateExitCode(65);
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(report(), 65);
    EXPECT_EQ(output.text(), "The staple and validate action failed! Error 65.\n");
}

TEST_F(Report, AGoodValidation) {
    controller->setOperation(kOperationValidate);
    file->setAppropriateExitCode(0);
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(report(), 0);
    EXPECT_EQ(output.text(), "The validate action worked!\n");
}

TEST_F(Report, AFailedValidation) {
    controller->setOperation(kOperationValidate);
    file->setAppropriateExitCode(65);
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(report(), 65);
    EXPECT_EQ(output.text(), "The validate action failed! Error 65.\n");
}

TEST_F(Report, AnyOperationButStapleIsReportedAsValidate) {
    controller->setOperation(7);
    file->setAppropriateExitCode(68);
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(report(), 68);
    EXPECT_EQ(output.text(), "The validate action failed! Error 68.\n");
}

TEST_F(Report, ARevokedTicketIsReportedAloneUnderTheFileName) {
    controller->setOperation(kOperationValidate);
    controller->writeDownloadedData(unsignedTicket({hash(0xAB)}, 1), nullptr);
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(report(), 77);
    EXPECT_EQ(output.text(),
              "The ticket for App.app has been revoked. Tollmark will prevent it from running.\n");
}

TEST_F(Report, DryrunAndForceHaveNoEffect) {
    EXPECT_FALSE(controller->dryrun());
    EXPECT_FALSE(controller->force());
    controller->setDryrun(true);
    controller->setForce(true);
    controller->setOperation(kOperationStaple);
    const Data ticket = unsignedTicket({hash(0xAB)});
    controller->writeDownloadedData(ticket, nullptr);
    EXPECT_EQ(test::readFile(stapledPath()), base::toString(ticket));
    controller->writeDownloadedData(unsignedTicket({hash(0x01)}), nullptr);
    EXPECT_EQ(file->appropriateExitCode(), 65);
}

}  // namespace
}  // namespace pinwell
