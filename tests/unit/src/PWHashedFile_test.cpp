#include "src/PWHashedFile/PWHashedFile.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <unistd.h>

#include <atomic>
#include <csignal>
#include <filesystem>
#include <functional>
#include <thread>

#include "base/bytes.h"
#include "src/PWHashedFile/PWHashedBundle.h"
#include "src/messages.h"
#include "support/message_capture.h"
#include "support/test_platform.h"
#include "values/url.h"

namespace pinwell {
namespace {

using base::Data;
using test::MessageCapture;

class Factory : public testing::Test {
  protected:
    std::shared_ptr<PWHashedFile> make(const std::string& name) {
        return PWHashedFile::initWithFileURL(platform.directory.url(name), platform.services());
    }
    static bool isBundle(const std::shared_ptr<PWHashedFile>& file) {
        return dynamic_cast<PWHashedBundle*>(file.get()) != nullptr;
    }

    test::TestPlatform platform;
};

TEST_F(Factory, APathThatDoesNotExistGivesTheBaseObjectWith66AndNoClassification) {
    const MessageCapture output(kVerbosityVerbose);
    const auto file = make("missing.app");
    ASSERT_NE(file, nullptr);
    EXPECT_FALSE(isBundle(file));
    EXPECT_EQ(file->appropriateExitCode(), 66);
    EXPECT_EQ(file->fileURL(), platform.directory.url("missing.app"));
    EXPECT_EQ(output.lines().size(), 1U);
    EXPECT_EQ(output.text().find("File " + (platform.directory / "missing.app") +
                                 " does not exist. Error Domain=POSIXErrorDomain Code=2"),
              0U);
}

TEST_F(Factory, AnApplicationIsABundle) {
    std::filesystem::create_directory(platform.directory / "A.app");
    const MessageCapture output(kVerbosityNormal);
    EXPECT_TRUE(isBundle(make("A.app")));
    EXPECT_EQ(output.text(), "Processing: " + (platform.directory / "A.app") + "\n");
}

TEST_F(Factory, VerboseRunShowsAllSixProperties) {
    std::filesystem::create_directory(platform.directory / "A.app");
    const MessageCapture output(kVerbosityVerbose);
    make("A.app");
    EXPECT_EQ(output.lines(), (std::vector<std::string>{
                                  "Processing: " + (platform.directory / "A.app"), "Properties are {",
                                  "    isApplication = 1;", "    isDirectory = 1;", "    isPackage = 1;",
                                  "    isSymbolicLink = 0;", "    localizedTypeDescription = application;",
                                  "    typeIdentifier = com.ostrel.application-bundle;", "}"}));
}

TEST_F(Factory, APlainExecutableIsABundle) {
    test::writeFile(platform.directory / "tool", std::string_view("code"));
    std::filesystem::permissions(platform.directory / "tool", std::filesystem::perms::owner_all);
    EXPECT_TRUE(isBundle(make("tool")));
}

TEST_F(Factory, APlainDirectoryIsRefusedAsAFolder) {
    std::filesystem::create_directory(platform.directory / "things");
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(make("things"), nullptr);
    EXPECT_EQ(output.lines()[1], "Pinwell is incapable of working with folder files.");
}

TEST_F(Factory, ATextFileIsRefusedByItsDescription) {
    test::writeFile(platform.directory / "notes.txt", std::string_view("text"));
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(make("notes.txt"), nullptr);
    // Later versions of the MIME database begin a description with a capital.
    EXPECT_THAT(output.lines()[1],
                testing::AnyOf("Pinwell is incapable of working with plain text document files.",
                               "Pinwell is incapable of working with Plain text document files."));
}

TEST_F(Factory, AFrameworkWithAMainExecutableIsABundleAndOneWithoutIsRefused) {
    test::writeFile(platform.directory / "With.framework/With", std::string_view("code"));
    std::filesystem::create_directory(platform.directory / "Without.framework");
    EXPECT_TRUE(isBundle(make("With.framework")));
    EXPECT_EQ(make("Without.framework"), nullptr);
}

TEST_F(Factory, ADirectoryNamedKEXTInCapitalsIsABundleEvenWithoutAnExecutable) {
    std::filesystem::create_directory(platform.directory / "Driver.KEXT");
    EXPECT_TRUE(isBundle(make("Driver.KEXT")));
}

TEST_F(Factory, ASymbolicLinkIsNotFollowed) {
    std::filesystem::create_directory(platform.directory / "A.app");
    std::filesystem::create_symlink("A.app", platform.directory / "Link.app");
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(make("Link.app"), nullptr);
    EXPECT_EQ(output.lines()[1], "Pinwell is incapable of working with alias files.");
}

// A kind whose hooks return the test's values and count their calls.
class ProbeFile : public PWHashedFile {
  public:
    using PWHashedFile::noteState;
    using PWHashedFile::PWHashedFile;

    std::optional<Data> _ticketData() override {
        ++ticketCalls;
        return ticket;
    }
    std::optional<Data> _cdHash() override {
        ++hashCalls;
        return Data(20, std::byte{1});
    }
    bool _writeNewTicketDataFromURL(const std::optional<URL>& source, const URL& target, bool deleteExisting,
                                    ErrorOut error) override {
        writtenSource = source;
        writtenTarget = target;
        deleting = deleteExisting;
        if (!writeSucceeds) {
            setAppropriateExitCode(kExitCannotCreate);
            if (error != nullptr) *error = Error::posix(ENOSPC);
            return false;
        }
        test::writeFile(target.path(), std::string_view("NEW"));
        if (whileWriting) whileWriting();
        setAppropriateExitCode(kExitOK);
        return true;
    }

    std::optional<Data> ticket;
    std::atomic<int> ticketCalls = 0;
    std::atomic<int> hashCalls = 0;
    bool writeSucceeds = true;
    std::function<void()> whileWriting;
    std::optional<URL> writtenSource;
    std::optional<URL> writtenTarget;
    bool deleting = false;
};

class Caches : public testing::Test {
  protected:
    test::TestPlatform platform;
    ProbeFile file{platform.directory.url("a.probe"), platform.services()};
};

TEST_F(Caches, AskTheHookOnce) {
    file.ticket = base::toData("ticket");
    EXPECT_EQ(file.ticketData(), base::toData("ticket"));
    file.ticket = base::toData("another");
    EXPECT_EQ(file.ticketData(), base::toData("ticket"));
    EXPECT_EQ(file.ticketCalls, 1);
}

TEST_F(Caches, AskTheHookOnceEvenWhenItFindsNothing) {
    EXPECT_EQ(file.ticketData(), std::nullopt);
    EXPECT_EQ(file.ticketData(), std::nullopt);
    EXPECT_EQ(file.ticketCalls, 1);
}

TEST_F(Caches, ReturnNothingForAnEmptyTicket) {
    file.ticket = Data{};
    EXPECT_EQ(file.ticketData(), std::nullopt);
    EXPECT_EQ(file.ticketData(), std::nullopt);
    EXPECT_EQ(file.ticketCalls, 1);
}

TEST_F(Caches, RunTheHookOnceForManyThreads) {
    std::vector<std::thread> threads;
    for (int i = 0; i < 8; ++i)
        threads.emplace_back([&] { EXPECT_EQ(file.cdHash(), Data(20, std::byte{1})); });
    for (auto& thread : threads) thread.join();
    EXPECT_EQ(file.hashCalls, 1);
}

TEST_F(Caches, MayAskTheOtherFromInsideAHook) {
    struct Nested : ProbeFile {
        using ProbeFile::ProbeFile;
        std::optional<Data> _cdHash() override { return ticketData(); }
    };
    Nested nested{platform.directory.url("a.probe"), platform.services()};
    nested.ticket = base::toData("ticket");
    EXPECT_EQ(nested.cdHash(), base::toData("ticket"));
}

TEST_F(Caches, OfThePlainBaseRaiseAndNameOperationAndClass) {
    PWHashedFile base{platform.directory.url("a.probe"), platform.services()};
    const auto reasonOf = [](auto&& call) -> std::string {
        try {
            call();
        } catch (const InternalInconsistency& raised) {
            return raised.what();
        }
        return "nothing was raised";
    };
    EXPECT_EQ(reasonOf([&] { base._cdHash(); }), "You must override _cdHash in the PWHashedFile subclass");
    EXPECT_EQ(reasonOf([&] { base._ticketData(); }),
              "You must override _ticketData in the PWHashedFile subclass");
    EXPECT_EQ(
        reasonOf([&] {
            base._writeNewTicketDataFromURL(std::nullopt, platform.directory.url("x"), true, nullptr);
        }),
        "You must override _writeNewTicketDataFromURL:intoURL:deleteExisting:error: in the PWHashedFile "
        "subclass");
}

class SafeReplacement : public testing::Test {
  protected:
    SafeReplacement() {
        test::writeFile(path, std::string_view("OLD"));
        test::writeFile(platform.directory / "ticket", std::string_view("TICKET"));
        platform.files.answerCloning(true);
    }

    bool staple(ErrorOut error = nullptr) { return file.writeNewTicketDataFromURL(source, error); }
    bool wroteInPlace() const { return file.writtenTarget == platform.directory.url("a.probe"); }

    test::TestPlatform platform;
    const std::string path = platform.directory / "a.probe";
    const URL source = platform.directory.url("ticket");
    ProbeFile file{platform.directory.url("a.probe"), platform.services()};
};

TEST_F(SafeReplacement, WorksOnACloneBesideTheFileAndSwapsItIn) {
    std::optional<Error> error = Error::osStatus(1);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_TRUE(staple(&error));
    EXPECT_FALSE(wroteInPlace());
    EXPECT_EQ(file.writtenSource, source);
    EXPECT_FALSE(file.deleting);
    EXPECT_EQ(file.writtenTarget->lastPathComponent(), "a.probe");
    EXPECT_EQ(test::readFile(path), "NEW");
    EXPECT_FALSE(error.has_value());
    EXPECT_EQ(output.lines(),
              (std::vector<std::string>{
                  "Attempting to attach a new ticket to a.probe. Let's see how that works out.",
                  "Cloned " + path + " to " + file.writtenTarget->path()}));
    EXPECT_FALSE(std::filesystem::exists(file.writtenTarget->deletingLastPathComponent().path()));
}

TEST_F(SafeReplacement, OnAVolumeWithoutCloningWritesInPlaceAndMakesNoDirectory) {
    platform.files.answerCloning(false);
    EXPECT_TRUE(staple());
    EXPECT_TRUE(wroteInPlace());
    EXPECT_EQ(platform.files.count("createReplacementDirectory"), 0U);
    EXPECT_EQ(platform.files.count("copyItem"), 0U);
    EXPECT_EQ(test::readFile(path), "NEW");
}

TEST_F(SafeReplacement, WithoutAResultAboutCloningWritesInPlace) {
    platform.files.fail("volumeSupportsCloning", EIO);
    EXPECT_TRUE(staple());
    EXPECT_TRUE(wroteInPlace());
    EXPECT_EQ(platform.files.count("createReplacementDirectory"), 0U);
}

TEST_F(SafeReplacement, WithoutAReplacementDirectoryWritesInPlace) {
    platform.files.fail("createReplacementDirectory", EACCES);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_TRUE(staple());
    EXPECT_TRUE(wroteInPlace());
    EXPECT_EQ(output.lines()[1].find("Could not create replacement directory for " + path +
                                     ". Error Domain=POSIXErrorDomain Code=13 "),
              0U);
    EXPECT_EQ(platform.files.count("replaceItem"), 0U);
}

TEST_F(SafeReplacement, WhenTheCopyFailsWritesInPlaceAndSwapsNothing) {
    platform.files.fail("copyItem", ENOSPC);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_TRUE(staple());
    EXPECT_TRUE(wroteInPlace());
    EXPECT_EQ(output.lines()[1].find("Could not copy backup to " + path +
                                     ". Error Domain=POSIXErrorDomain Code=28 "),
              0U);
    EXPECT_EQ(platform.files.count("replaceItem"), 0U);
}

TEST_F(SafeReplacement, InPlaceLeavesTheCallersErrorAlone) {
    std::optional<Error> error = Error::osStatus(1);
    platform.files.fail("copyItem", ENOSPC);
    EXPECT_TRUE(staple(&error));
    EXPECT_EQ(error, Error::osStatus(1)) << "nor does it hand out why there was no copy";
    platform.files.answerCloning(false);
    EXPECT_TRUE(staple(&error));
    EXPECT_EQ(error, Error::osStatus(1));
}

TEST_F(SafeReplacement, MayBeCalledWithoutAPlaceForTheError) {
    platform.files.fail("replaceItem", EBUSY);
    EXPECT_TRUE(staple(nullptr));
}

TEST_F(SafeReplacement, AFailedWriteLeavesTheFileAndTheCopyAndTheCallersErrorAlone) {
    file.writeSucceeds = false;
    std::optional<Error> error = Error::osStatus(1);
    EXPECT_FALSE(staple(&error));
    EXPECT_EQ(file.appropriateExitCode(), 73);
    EXPECT_EQ(error, Error::osStatus(1));
    EXPECT_EQ(test::readFile(path), "OLD");
    EXPECT_EQ(test::readFile(file.writtenTarget->path()), "OLD");
    EXPECT_EQ(platform.files.count("replaceItem"), 0U);
}

TEST_F(SafeReplacement, AFailedSwapReturnsTrueKeepsTheCodeAndReturnsTheError) {
    platform.files.fail("replaceItem", EBUSY);
    std::optional<Error> error;
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_TRUE(staple(&error));
    EXPECT_EQ(error->code(), EBUSY);
    EXPECT_EQ(file.appropriateExitCode(), 0);
    EXPECT_EQ(test::readFile(path), "OLD");
    EXPECT_EQ(test::readFile(file.writtenTarget->path()), "NEW");
    EXPECT_EQ(output.lines()[2].find("Could not replace " + path + " with the safetly modified file at " +
                                     file.writtenTarget->absoluteString() +
                                     ". Error Domain=POSIXErrorDomain Code=16 "),
              0U);
    EXPECT_EQ(platform.files.count("trashItem"), 0U);
}

TEST_F(SafeReplacement, ATrashThatTakesTheCopyIsReported) {
    platform.files.answerTrash(platform.directory.url("trash/a.probe"));
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_TRUE(staple());
    EXPECT_EQ(output.lines()[2],
              "Successfully trashed " + platform.directory.url("trash/a.probe").absoluteString() + "!!!");
}

TEST_F(SafeReplacement, ACopyThatCannotBeTrashedIsSilentAndNoError) {
    platform.files.fail("trashItem", ENOENT);
    std::optional<Error> error = Error::osStatus(1);
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_TRUE(staple(&error));
    EXPECT_FALSE(error.has_value());
    EXPECT_EQ(output.lines().size(), 2U);
}

// A file that was read before, so a write depends on its state at that time.
class ChangedFile : public SafeReplacement {
  protected:
    ChangedFile() { file.noteState(); }

    static void changeOnce(const std::string& changed) {
        // The clock of the file system may not advance between two changes; the length does.
        test::writeFile(changed, std::string_view("CHANGED"));
    }
    void expectRefused() {
        const MessageCapture output(kVerbosityNormal);
        EXPECT_FALSE(staple());
        EXPECT_EQ(output.lines(), std::vector<std::string>{
                                      path + " has changed since it was read. Nothing was written to it."});
        EXPECT_EQ(file.appropriateExitCode(), 73);
        for (const auto& entry : std::filesystem::directory_iterator(platform.directory.path()))
            EXPECT_EQ(entry.path().filename().native().find(".pinwell"), std::string::npos) << entry.path();
    }
};

TEST_F(ChangedFile, IsWrittenWhenNothingHasHappenedToIt) {
    EXPECT_TRUE(staple());
    EXPECT_EQ(test::readFile(path), "NEW");
}

TEST_F(ChangedFile, IsNotWrittenInPlace) {
    platform.files.answerCloning(false);
    changeOnce(path);
    expectRefused();
    EXPECT_FALSE(file.writtenTarget.has_value());
    EXPECT_EQ(test::readFile(path), "CHANGED");
}

TEST_F(ChangedFile, IsNotReplaced) {
    changeOnce(path);
    expectRefused();
    EXPECT_EQ(test::readFile(path), "CHANGED");
}

TEST_F(ChangedFile, ThatChangesWhileItsCloneIsWrittenIsNotReplaced) {
    file.whileWriting = [&] { changeOnce(path); };
    expectRefused();
    EXPECT_EQ(test::readFile(path), "CHANGED");
    EXPECT_EQ(platform.files.count("replaceItem"), 0U);
}

TEST_F(ChangedFile, IsOneThatAnotherOfTheSameContentsHasReplaced) {
    test::writeFile(platform.directory / "other", std::string_view("OLD"));
    std::filesystem::rename(platform.directory / "other", path);
    expectRefused();
}

TEST_F(ChangedFile, IsOneThatIsGone) {
    std::filesystem::remove(path);
    platform.files.answerCloning(false);
    expectRefused();
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(ChangedFile, IsAFileWhoseStateIsUnknown) {
    platform.files.fail("stateOfItem", EIO);
    expectRefused();
    EXPECT_EQ(test::readFile(path), "OLD");
}

TEST_F(SafeReplacement, OfAFileWhoseStateWasUnknownAtTheReadIsRefused) {
    platform.files.fail("stateOfItem", EIO);
    file.noteState();
    platform.files.fail("stateOfItem", 0);
    EXPECT_FALSE(staple());
    EXPECT_EQ(file.appropriateExitCode(), 73);
    EXPECT_EQ(test::readFile(path), "OLD");
}

// The signal that interrupts a write. It is sent to the whole process, as a terminal does.
class InterruptedReplacement : public SafeReplacement, public testing::WithParamInterface<int> {
  protected:
    InterruptedReplacement() {
        std::signal(GetParam(), [](int) { taken = true; });
    }
    ~InterruptedReplacement() override { std::signal(GetParam(), SIG_DFL); }

    static inline std::atomic<bool> taken = false;
};

TEST_P(InterruptedReplacement, IsFinishedFirst) {
    for (const bool clones : {true, false}) {
        taken = false;
        platform.files.answerCloning(clones);
        bool takenTooEarly = true;
        file.whileWriting = [&] {
            kill(getpid(), GetParam());
            takenTooEarly = taken;
        };
        EXPECT_TRUE(staple());
        EXPECT_FALSE(takenTooEarly);
        EXPECT_TRUE(taken);
        EXPECT_EQ(test::readFile(path), "NEW");
    }
}

INSTANTIATE_TEST_SUITE_P(BySignal, InterruptedReplacement, testing::Values(SIGHUP, SIGINT, SIGTERM),
                         [](const auto& test) {
                             switch (test.param) {
                                 case SIGHUP:
                                     return "SIGHUP";
                                 case SIGINT:
                                     return "SIGINT";
                                 default:
                                     return "SIGTERM";
                             }
                         });

TEST_F(SafeReplacement, DeletingGoesTheSameRoadWithoutASource) {
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_TRUE(file._deleteExistingTicket(nullptr));
    EXPECT_TRUE(file.deleting);
    EXPECT_FALSE(file.writtenSource.has_value());
    EXPECT_EQ(test::readFile(path), "NEW");
    EXPECT_EQ(output.lines()[0],
              "Attempting to delete the existing ticket attatched a.probe. Let's see how that works out.");
}

}  // namespace
}  // namespace pinwell
