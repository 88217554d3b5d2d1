// The end of a run: with its own exit status, or with its controller's.
#include "src/run.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/file.h>

#include <cerrno>
#include <chrono>
#include <filesystem>
#include <thread>

#include "src/DownloadDelegate.h"
#include "support/controller_run.h"
#include "support/message_capture.h"

namespace pinwell::test {
namespace {

using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::StartsWith;

/// A bundle with a ticket at the service, which never responds.
class Run : public testing::Test {
  protected:
    int operate(std::uint8_t operation, const std::string& path) {
        return runOperation(operation, URL::fileURLWithPath(path), made.platform.services(),
                            [this] { ++waits; });
    }
    int staple() { return operate(kOperationStaple, made.artefact()); }

    ControllerRun made;
    TestPlatform& platform = made.platform;
    const MessageCapture output{kVerbosityNormal};
    int waits = 0;
};

TEST_F(Run, WaitsForItsControllerOnceTheLookupIsUnderWay) {
    EXPECT_EQ(staple(), kExitOK);
    EXPECT_EQ(waits, 1);
    EXPECT_EQ(platform.https.sessions.size(), 1U);
}

TEST_F(Run, ThatStartsNothingEndsWithItsRecordedCode) {
    platform.codeSigning.information.reset();
    EXPECT_EQ(staple(), kExitNoInput);
    EXPECT_EQ(waits, 0);
}

TEST_F(Run, OfAnUnreadableFileEndsWithTheFilesOwnCode) {
    EXPECT_EQ(operate(kOperationStaple, platform.directory / "none"), kExitNoInput);
    EXPECT_EQ(waits, 0);
}

TEST_F(Run, OfAKindThatIsNotSupportedEndsWith66) {
    writeFile(platform.directory / "notes.txt", std::string_view("text"));
    EXPECT_EQ(operate(kOperationStaple, platform.directory / "notes.txt"), kExitNoInput);
    EXPECT_THAT(output.lines(), Contains(StartsWith("Pinwell is incapable of working with")));
}

TEST_F(Run, ThatStaplesAFileLockedByAnotherEndsWith73BeforeItReadsAnything) {
    platform.files.fail("lockItem", EBUSY);
    EXPECT_EQ(staple(), kExitCannotCreate);
    EXPECT_THAT(output.lines(),
                ElementsAre("Processing: " + made.artefact(), "Another process keeps " + made.artefact() +
                                                                  " locked. Nothing was written to it."));
    EXPECT_THAT(platform.files.names(), ElementsAre("resourceProperties", "lockItem"));
    EXPECT_EQ(waits, 0);
}

TEST_F(Run, LocksNothingOfAKindThatIsNotSupported) {
    writeFile(platform.directory / "notes.txt", std::string_view("text"));
    platform.files.fail("lockItem", EBUSY);
    EXPECT_EQ(operate(kOperationStaple, platform.directory / "notes.txt"), kExitNoInput);
    EXPECT_THAT(output.lines(), Contains(StartsWith("Pinwell is incapable of working with ")));
    EXPECT_EQ(platform.files.count("lockItem"), 0U);
}

TEST_F(Run, LocksNothingThatIsNotThere) {
    EXPECT_EQ(operate(kOperationStaple, platform.directory / "none"), kExitNoInput);
    EXPECT_EQ(platform.files.count("lockItem"), 0U);
}

bool isLocked(const std::string& path) {
    const base::FileDescriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
    return flock(file.get(), LOCK_EX | LOCK_NB) != 0 && errno == EWOULDBLOCK;
}

TEST_F(Run, LocksTheArtefactWhileItWaits) {
    bool locked = false;
    runOperation(kOperationStaple, URL::fileURLWithPath(made.artefact()), platform.services(),
                 [&] { locked = isLocked(made.artefact()); });
    EXPECT_TRUE(locked);
}

TEST_F(Run, SaysInItsVerboseOutputThatItWaitsForALock) {
    const MessageCapture verbose(kVerbosityVerbose);
    const base::FileDescriptor other(open(made.artefact().c_str(), O_RDONLY | O_CLOEXEC));
    ASSERT_EQ(flock(other.get(), LOCK_EX), 0);
    std::thread release([&] {
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
        flock(other.get(), LOCK_UN);
    });
    EXPECT_EQ(staple(), kExitOK);
    release.join();
    EXPECT_THAT(verbose.lines(),
                Contains("Waiting for another process that keeps " + made.artefact() + " locked."));
}

TEST_F(Run, ThatStaplesGoesOnWhereNothingCanBeLocked) {
    for (const int reason : {EOPNOTSUPP, ENOLCK, EACCES}) {
        platform.files.fail("lockItem", reason);
        EXPECT_EQ(staple(), kExitOK) << reason;
    }
    EXPECT_EQ(waits, 3);
}

TEST_F(Run, ThatValidatesLocksNothing) {
    operate(kOperationValidate, made.artefact());
    EXPECT_EQ(platform.files.count("lockItem"), 0U);
    EXPECT_THAT(platform.files.changes(), IsEmpty());
}

TEST_F(Run, WithoutASessionEndsLikeOneWithoutAConnection) {
    platform.https.failure = base::Error(std::string(base::kURLErrorDomain), 14, "no thread");
    EXPECT_EQ(platform.exitStatusOf([this] { staple(); }), kExitNoHost);
    EXPECT_THAT(output.lines(), Contains(StartsWith("error is ")));
}

}  // namespace
}  // namespace pinwell::test
