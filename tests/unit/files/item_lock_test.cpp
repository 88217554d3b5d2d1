// One writer at a time, even if the file is replaced while they wait.
#include "files/operations.h"

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <filesystem>
#include <future>

#include "base/handle.h"
#include "fixture.h"
#include "support/volume.h"
#include "values/url.h"

namespace pinwell::test {
namespace {

using namespace std::chrono_literals;
using files::lockPath;

class Lock : public FilesTest {
  protected:
    Lock() { writeFile(path("file"), "contents"); }

    static void silent() {}

    bool isLocked(std::string_view name) const {
        const base::FileDescriptor file(open(path(name).c_str(), O_RDONLY | O_CLOEXEC));
        return flock(file.get(), LOCK_EX | LOCK_NB) != 0 && errno == EWOULDBLOCK;
    }

    base::Places places;
};

TEST_F(Lock, HoldsUntilItDies) {
    {
        const auto lock = manager->lockItem(url("file"), silent);
        ASSERT_THAT(lock, Succeeds());
        EXPECT_TRUE(isLocked("file"));
    }
    EXPECT_FALSE(isLocked("file"));
    EXPECT_EQ(readFile(path("file")), "contents");
}

TEST_F(Lock, CanBeTakenOnADirectory) {
    makeDirectory(path("directory"));
    const auto lock = manager->lockItem(url("directory"), silent);
    ASSERT_THAT(lock, Succeeds());
    EXPECT_TRUE(isLocked("directory"));
}

TEST_F(Lock, ThatAnotherHoldsIsBusyWhenPatienceEnds) {
    const auto first = lockPath(places, path("file"), 0ms, silent);
    ASSERT_THAT(first, Succeeds());
    EXPECT_THAT(lockPath(places, path("file"), 0ms, silent), FailsWith(EBUSY, path("file")));
    EXPECT_THAT(lockPath(places, path("file"), 30ms, silent), FailsWith(EBUSY, path("file")));
}

TEST_F(Lock, ReportsOnceThatItWaits) {
    int said = 0;
    const auto first = lockPath(places, path("file"), 0ms, [&] { ++said; });
    EXPECT_EQ(said, 0);
    EXPECT_THAT(lockPath(places, path("file"), 50ms, [&] { ++said; }), FailsWith(EBUSY, path("file")));
    EXPECT_EQ(said, 1);
}

TEST_F(Lock, IsNotTakenWhereItWouldBlockOthers) {
    // The values of linux/magic.h: SMB, CIFS and SMB2, even if the field is signed and has 32 bits.
    for (const std::int64_t type : {std::int64_t{0x517B}, std::int64_t{0xFF534D42}, std::int64_t{0xFE534D42},
                                    std::int64_t{static_cast<std::int32_t>(0xFF534D42)}})
        EXPECT_TRUE(files::hasMandatoryLocks(type)) << std::hex << type;
    // ext2 to ext4, XFS, btrfs, tmpfs, NFS.
    for (const std::int64_t type : {0xEF53LL, 0x58465342LL, 0x9123683ELL, 0x01021994LL, 0x6969LL})
        EXPECT_FALSE(files::hasMandatoryLocks(type)) << std::hex << type;
}

TEST_F(Lock, IsTakenWhenTheOtherIsReleased) {
    auto first = lockPath(places, path("file"), 0ms, silent);
    ASSERT_THAT(first, Succeeds());
    auto second = std::async(std::launch::async, [&] { return manager->lockItem(url("file"), silent); });
    first = base::Error::posix(ECANCELED);
    ASSERT_THAT(second.get(), Succeeds());
}

TEST_F(Lock, IsOnTheFileThatThePathNamesAfterwards) {
    auto first = lockPath(places, path("file"), 0ms, silent);
    ASSERT_THAT(first, Succeeds());
    auto second = std::async(std::launch::async, [&] { return manager->lockItem(url("file"), silent); });
    writeFile(path("other"), "new");
    std::filesystem::rename(path("other"), path("file"));
    first = base::Error::posix(ECANCELED);
    const auto lock = second.get();
    ASSERT_THAT(lock, Succeeds());
    EXPECT_TRUE(isLocked("file"));
}

TEST_F(Lock, IsRefusedWhereThereIsNothingToLock) {
    makeFifo(path("fifo"));
    makeLink("file", path("link"));
    EXPECT_THAT(manager->lockItem(url("none"), silent), FailsWith(ENOENT, path("none")));
    EXPECT_THAT(manager->lockItem(url("fifo"), silent), FailsWith(EINVAL, path("fifo")));
    EXPECT_THAT(manager->lockItem(url("link"), silent), FailsWith(ELOOP, path("link")));
}

class State : public FilesTest {
  protected:
    State() { writeFile(path("file"), "contents"); }
    files::ItemState state() { return *manager->stateOfItem(url("file")); }
};

TEST_F(State, StaysWhenTheFileIsReadAndCloned) {
    const auto before = state();
    readFile(path("file"));
    ASSERT_THAT(manager->volumeSupportsCloning(url("file")), Succeeds());
    ASSERT_THAT(manager->copyItem(url("file"), url("copy")), Succeeds());
    EXPECT_EQ(state(), before);
}

TEST_F(State, StaysWhenTheFileIsClonedOnVolumesThatClone) {
    for (const char* fileSystem : {"xfs", "btrfs"}) {
        const Volume volume(fileSystem);
        if (volume.missing()) GTEST_SKIP() << *volume.missing();
        const auto file = files::URL::fileURLWithPath(volume / "file");
        writeFile(file.path(), irregularBytes(100'000));
        const auto before = manager->stateOfItem(file);
        ASSERT_TRUE(*manager->volumeSupportsCloning(file));
        ASSERT_THAT(manager->copyItem(file, files::URL::fileURLWithPath(volume / "copy")), Succeeds());
        sync();
        EXPECT_EQ(*manager->stateOfItem(file), *before) << fileSystem;
    }
}

TEST_F(State, SeesAnotherLength) {
    const auto before = state();
    writeFile(path("file"), "longer contents");
    EXPECT_NE(state(), before);
}

TEST_F(State, SeesAReplacedFile) {
    const auto before = state();
    writeFile(path("other"), "contents");
    std::filesystem::rename(path("other"), path("file"));
    EXPECT_NE(state(), before);
}

TEST_F(State, DoesNotCountModeLinksAndAttributes) {
    const auto before = state();
    setMode(path("file"), 0400);
    std::filesystem::create_hard_link(path("file"), path("second name"));
    setAttribute(path("file"), "user.note", "read");
    EXPECT_EQ(state(), before);
}

TEST_F(State, SeesTimesANanosecondApart) {
    for (const long nanoseconds : {1L, 2L}) {
        const std::array<timespec, 2> times{timespec{0, UTIME_OMIT}, timespec{1000, nanoseconds}};
        ASSERT_EQ(utimensat(AT_FDCWD, path("file").c_str(), times.data(), 0), 0);
        EXPECT_EQ(state().modifiedSeconds, 1000);
        EXPECT_EQ(state().modifiedNanoseconds, nanoseconds);
    }
}

TEST_F(State, OfAMissingFileIsAnError) {
    EXPECT_THAT(manager->stateOfItem(url("none")), FailsWith(ENOENT, path("none")));
}

}  // namespace
}  // namespace pinwell::test
