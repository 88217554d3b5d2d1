// Copies of items and of their contents, and whether the file system can clone.
#include <fcntl.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <array>
#include <filesystem>

#include "fixture.h"
#include "support/volume.h"

namespace pinwell::test {
namespace {

using files::URL;
using testing::ElementsAre;

constexpr const char* kDefaultAccessControlList = "system.posix_acl_default";

class Copy : public FilesTest {
  protected:
    Copy() { writeFile(path("source"), "contents"); }

    auto copy() { return manager->copyItem(url("source"), url("copy")); }
    auto copyBetween(const std::string& source, const std::string& destination) {
        return manager->copyItem(URL::fileURLWithPath(source), URL::fileURLWithPath(destination));
    }
};

TEST_F(Copy, HasTheSameContents) {
    const std::string contents = irregularBytes(1'000'003);
    writeFile(path("source"), contents);
    ASSERT_THAT(copy(), Succeeds());
    EXPECT_EQ(readFile(path("copy")), contents);
    EXPECT_EQ(readFile(path("source")), contents);
}

TEST_F(Copy, OfAnEmptyFileIsEmpty) {
    writeFile(path("source"), "");
    ASSERT_THAT(copy(), Succeeds());
    EXPECT_EQ(readFile(path("copy")), "");
}

TEST_F(Copy, KeepsTheMode) {
    for (const mode_t mode : {0444U, 0755U, 0640U, 06755U}) {
        setMode(path("source"), mode);
        ASSERT_THAT(copy(), Succeeds());
        EXPECT_EQ(permissionsOf(path("copy")), mode);
        unlink(path("copy").c_str());
    }
}

TEST_F(Copy, KeepsTheModeWhateverTheFileCreationMaskIs) {
    setMode(path("source"), 0666);
    const mode_t before = umask(0077);
    const auto done = copy();
    umask(before);
    ASSERT_THAT(done, Succeeds());
    EXPECT_EQ(permissionsOf(path("copy")), 0666U);
}

TEST_F(Copy, KeepsTheTimesToTheNanosecond) {
    const std::array<timespec, 2> times{timespec{1'000'000'000, 123'456'789},
                                        timespec{1'100'000'000, 987'654'321}};
    ASSERT_EQ(utimensat(AT_FDCWD, path("source").c_str(), times.data(), 0), 0);
    ASSERT_THAT(copy(), Succeeds());
    const auto status = statusOf(path("copy"));
    EXPECT_EQ(status.st_atim.tv_sec, times[0].tv_sec);
    EXPECT_EQ(status.st_atim.tv_nsec, times[0].tv_nsec);
    EXPECT_EQ(status.st_mtim.tv_sec, times[1].tv_sec);
    EXPECT_EQ(status.st_mtim.tv_nsec, times[1].tv_nsec);
}

TEST_F(Copy, KeepsExtendedAttributesOfAReadOnlyFile) {
    setAttribute(path("source"), "user.origin", "somewhere");
    setAttribute(path("source"), "user.empty", "");
    setMode(path("source"), 0444);
    ASSERT_THAT(copy(), Succeeds());
    EXPECT_EQ(attribute(path("copy"), "user.origin"), "somewhere");
    EXPECT_EQ(attribute(path("copy"), "user.empty"), "");
}

TEST_F(Copy, KeepsTheAccessControlList) {
    setAttribute(path("source"), kAccessControlList, listThatLetsAnotherRead());
    ASSERT_THAT(copy(), Succeeds());
    EXPECT_EQ(attribute(path("copy"), kAccessControlList), listThatLetsAnotherRead());
    EXPECT_EQ(permissionsOf(path("copy")), permissionsOf(path("source")));
}

TEST_F(Copy, TakesNoAccessControlListFromTheDirectory) {
    makeDirectory(path("folder"));
    setAttribute(path("folder"), kDefaultAccessControlList, listThatLetsAnotherRead());
    ASSERT_THAT(manager->copyItem(url("source"), url("folder/copy")), Succeeds());
    EXPECT_EQ(attribute(path("folder/copy"), kAccessControlList), std::nullopt);
    EXPECT_EQ(permissionsOf(path("folder/copy")), permissionsOf(path("source")));
}

TEST_F(Copy, KeepsTheOwnerWhenTheSuperuserMakesIt) {
    if (!isSuperuser()) GTEST_SKIP() << "only the superuser may give files away";
    ASSERT_EQ(chown(path("source").c_str(), 1234, 2345), 0);
    setMode(path("source"), 06755);
    ASSERT_THAT(copy(), Succeeds());
    EXPECT_EQ(statusOf(path("copy")).st_uid, 1234U);
    EXPECT_EQ(statusOf(path("copy")).st_gid, 2345U);
    EXPECT_EQ(permissionsOf(path("copy")), 06755U);
}

TEST_F(Copy, ByAnotherThanTheOwnerLosesTheSetIDBits) {
    if (!isSuperuser()) GTEST_SKIP() << "takes a file of the superuser's";
    setMode(path("source"), 06755);
    const AsOrdinaryUser user(directory.path());
    ASSERT_THAT(copy(), Succeeds());
    EXPECT_EQ(statusOf(path("copy")).st_uid, geteuid());
    EXPECT_EQ(permissionsOf(path("copy")), 0755U);
}

TEST_F(Copy, KeepsAFileCapabilityWhenTheSuperuserMakesIt) {
    if (!isSuperuser()) GTEST_SKIP() << "only the superuser may give capabilities";
    const std::string netBindService(
        "\x01\x00\x00\x02\x00\x04\x00\x00\x00\x00\x00\x00\x00\x00\x00\x00\x00\x00\x00\x00", 20);
    setAttribute(path("source"), "security.capability", netBindService);
    ASSERT_THAT(copy(), Succeeds());
    EXPECT_EQ(attribute(path("copy"), "security.capability"), netBindService);
}

TEST_F(Copy, OfASparseFileIsSparse) {
    constexpr off_t kLength = off_t{1} << 33U;
    const int file = open(path("source").c_str(), O_WRONLY | O_TRUNC | O_CLOEXEC);
    ASSERT_GE(file, 0);
    ASSERT_EQ(pwrite(file, "begin", 5, 0), 5);
    ASSERT_EQ(pwrite(file, "middle", 6, kLength / 2), 6);
    ASSERT_EQ(ftruncate(file, kLength), 0);
    close(file);
    ASSERT_THAT(copy(), Succeeds());
    const auto status = statusOf(path("copy"));
    EXPECT_EQ(status.st_size, kLength);
    EXPECT_LT(status.st_blocks, 1024);
    std::array<char, 6> middle{};
    const int copied = open(path("copy").c_str(), O_RDONLY | O_CLOEXEC);
    EXPECT_EQ(pread(copied, middle.data(), 6, kLength / 2), 6);
    close(copied);
    EXPECT_EQ(std::string(middle.data(), 6), "middle");
}

TEST_F(Copy, OfAHardLinkIsAFileOfItsOwn) {
    ASSERT_EQ(link(path("source").c_str(), path("other name").c_str()), 0);
    ASSERT_THAT(copy(), Succeeds());
    EXPECT_EQ(statusOf(path("copy")).st_nlink, 1U);
    EXPECT_EQ(statusOf(path("source")).st_nlink, 2U);
}

TEST_F(Copy, TakesNamesThatAreNotUTF8AndNamesOf255Bytes) {
    const std::string longest(255, 'n');
    ASSERT_THAT(manager->copyItem(url("source"), url("\xC3\x28")), Succeeds());
    ASSERT_THAT(manager->copyItem(url("\xC3\x28"), url(longest)), Succeeds());
    EXPECT_EQ(readFile(path(longest)), "contents");
}

TEST_F(Copy, RefusesADestinationThatExists) {
    writeFile(path("copy"), "old");
    EXPECT_THAT(copy(), FailsWith(EEXIST, path("copy")));
    EXPECT_EQ(readFile(path("copy")), "old");
}

TEST_F(Copy, DoesNotWriteThroughALinkAtTheDestination) {
    makeLink("target", path("copy"));
    EXPECT_THAT(copy(), FailsWith(EEXIST, path("copy")));
    EXPECT_FALSE(exists(path("target")));
}

TEST_F(Copy, RefusesASourceThatIsNoRegularFile) {
    makeDirectory(path("folder"));
    makeLink("source", path("link"));
    makeFifo(path("fifo"));
    EXPECT_THAT(manager->copyItem(url("folder"), url("copy")), FailsWith(EISDIR, path("folder")));
    EXPECT_THAT(manager->copyItem(url("link"), url("copy")), FailsWith(ELOOP, path("link")));
    EXPECT_THAT(manager->copyItem(url("fifo"), url("copy")), FailsWith(EINVAL, path("fifo")));
    EXPECT_THAT(manager->copyItem(url("none"), url("copy")), FailsWith(ENOENT, path("none")));
    EXPECT_FALSE(exists(path("copy")));
}

TEST_F(Copy, IntoADirectoryThatIsNotThereFails) {
    EXPECT_THAT(manager->copyItem(url("source"), url("none/copy")), FailsWith(ENOENT, path("none/copy")));
}

TEST_F(Copy, OfAFileThatMayNotBeReadFails) {
    const AsOrdinaryUser user(directory.path());
    writeFile(path("secret"), "x");
    setMode(path("secret"), 0200);
    EXPECT_THAT(manager->copyItem(url("secret"), url("copy")), FailsWith(EACCES, path("secret")));
    EXPECT_FALSE(exists(path("copy")));
}

TEST_F(Copy, OntoAFullVolumeFailsAndLeavesNothing) {
    const Volume volume("tmpfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    writeFile(path("source"), irregularBytes(2'000'000));
    EXPECT_THAT(copyBetween(path("source"), volume / "copy"), FailsWith(ENOSPC, volume / "copy"));
    EXPECT_THAT(namesIn(volume.path()), ElementsAre());
}

TEST_F(Copy, BetweenVolumesKeepsContentsModeAndTimes) {
    const Volume volume("tmpfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    const std::string contents = irregularBytes(300'001);
    writeFile(path("source"), contents);
    setMode(path("source"), 0640);
    ASSERT_THAT(copyBetween(path("source"), volume / "copy"), Succeeds());
    EXPECT_EQ(readFile(volume / "copy"), contents);
    EXPECT_EQ(permissionsOf(volume / "copy"), 0640U);
    EXPECT_EQ(statusOf(volume / "copy").st_mtim.tv_nsec, statusOf(path("source")).st_mtim.tv_nsec);
}

TEST_F(Copy, OnAVolumeThatClonesTakesNoSpace) {
    const Volume volume("xfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    const std::string contents = irregularBytes(16U << 20U);
    writeFile(volume / "source", contents);
    setAttribute(volume / "source", "user.origin", "somewhere");
    const auto freeBlocks = [&] {
        struct statvfs status {};
        const int file = open(volume.path().c_str(), O_RDONLY | O_CLOEXEC);
        syncfs(file);
        close(file);
        statvfs(volume.path().c_str(), &status);
        return status.f_bfree * status.f_frsize;
    };
    const auto before = freeBlocks();
    ASSERT_THAT(copyBetween(volume / "source", volume / "copy"), Succeeds());
    EXPECT_LT(before - freeBlocks(), 1U << 20U);
    EXPECT_EQ(readFile(volume / "copy"), contents);
    EXPECT_EQ(attribute(volume / "copy", "user.origin"), "somewhere");
}

class CopyOfContents : public FilesTest {
  protected:
    CopyOfContents() { writeFile(path("source"), "contents"); }

    auto copy() { return manager->copyContents(url("source"), url("copy")); }
};

TEST_F(CopyOfContents, HasTheBytesAndTheModeOfAnyNewFile) {
    setMode(path("source"), 0400);
    const mode_t before = umask(027);
    const auto done = copy();
    umask(before);
    ASSERT_THAT(done, Succeeds());
    EXPECT_EQ(readFile(path("copy")), "contents");
    EXPECT_EQ(permissionsOf(path("copy")), 0640U);
}

TEST_F(CopyOfContents, NeverReplacesAnExistingFile) {
    writeFile(path("copy"), "there before");
    EXPECT_THAT(copy(), FailsWith(EEXIST, path("copy")));
    EXPECT_EQ(readFile(path("copy")), "there before");
}

TEST_F(CopyOfContents, NeverWritesThroughALink) {
    makeLink("elsewhere", path("copy"));
    EXPECT_THAT(copy(), FailsWith(EEXIST, path("copy")));
    EXPECT_FALSE(exists(path("elsewhere")));
}

TEST_F(CopyOfContents, GoesIntoADirectoryThatMayNotBeRead) {
    const AsOrdinaryUser user(directory.path());
    writeFile(path("ticket"), "x");
    makeDirectory(path("closed"), 0300);
    EXPECT_THAT(manager->copyContents(url("ticket"), url("closed/copy")), Succeeds());
    setMode(path("closed"), 0700);
    EXPECT_EQ(readFile(path("closed/copy")), "x");
}

TEST_F(CopyOfContents, TakesRegularFilesOnly) {
    makeDirectory(path("directory"));
    EXPECT_THAT(manager->copyContents(url("directory"), url("copy")), FailsWith(EISDIR, path("directory")));
    makeFifo(path("pipe"));
    EXPECT_THAT(manager->copyContents(url("pipe"), url("copy")), FailsWith(EINVAL, path("pipe")));
    EXPECT_FALSE(exists(path("copy")));
}

class Cloning : public FilesTest {
  protected:
    // The result for a file with these contents; also checks that the probe leaves no trace.
    bool answerOn(const Volume& volume, const std::string& contents) {
        const std::string file = volume / "file";
        writeFile(file, contents);
        const auto before = statusOf(file);
        const auto names = namesIn(volume.path());
        const auto answer = manager->volumeSupportsCloning(URL::fileURLWithPath(file));
        EXPECT_THAT(answer, Succeeds());
        EXPECT_EQ(namesIn(volume.path()), names);
        EXPECT_EQ(readFile(file), contents);
        EXPECT_EQ(statusOf(file).st_ctim.tv_nsec, before.st_ctim.tv_nsec);
        return answer && *answer;
    }
};

TEST_F(Cloning, IsSupportedOnXFSWithReflinks) {
    const Volume volume("xfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    EXPECT_TRUE(answerOn(volume, irregularBytes(5000)));
}

TEST_F(Cloning, IsSupportedForAnEmptyFile) {
    const Volume volume("xfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    EXPECT_TRUE(answerOn(volume, ""));
}

TEST_F(Cloning, IsSupportedForAFileLongerThanTheProbe) {
    const Volume volume("xfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    EXPECT_TRUE(answerOn(volume, irregularBytes(3'000'001)));
}

TEST_F(Cloning, IsSupportedOnBtrfs) {
    const Volume volume("btrfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    EXPECT_TRUE(answerOn(volume, irregularBytes(5000)));
}

TEST_F(Cloning, IsNotSupportedOnXFSWithoutReflinks) {
    const Volume volume("xfs -m reflink=0");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    EXPECT_FALSE(answerOn(volume, irregularBytes(5000)));
    EXPECT_FALSE(answerOn(volume, ""));
}

TEST_F(Cloning, IsNotSupportedInMemory) {
    const Volume volume("tmpfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    EXPECT_FALSE(answerOn(volume, irregularBytes(5000)));
}

TEST_F(Cloning, IsProbedOnEveryFileSystemWithoutATrace) {
    writeFile(path("file"), "contents");
    EXPECT_THAT(manager->volumeSupportsCloning(url("file")), Succeeds());
    EXPECT_THAT(namesIn(directory.path()), ElementsAre("file"));
    EXPECT_EQ(readFile(path("file")), "contents");
}

TEST_F(Cloning, CannotBeProbedForAnUnreadableFile) {
    const AsOrdinaryUser user(directory.path());
    writeFile(path("file"), "contents");
    setMode(path("file"), 0200);
    EXPECT_THAT(manager->volumeSupportsCloning(url("file")), FailsWith(EACCES, path("file")));
}

// The probe makes nothing, so the run continues and finds that it cannot make a directory there.
TEST_F(Cloning, IsProbedInAReadOnlyDirectory) {
    const Volume volume("xfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    writeFile(volume / "folder/file", irregularBytes(5000));
    setMode(std::filesystem::path(volume.path()).parent_path(), 0755);
    giveToOrdinaryUser(volume / "folder");
    setMode(volume / "folder", 0500);
    const AsOrdinaryUser user;
    const auto file = URL::fileURLWithPath(volume / "folder/file");
    const auto answer = manager->volumeSupportsCloning(file);
    ASSERT_THAT(answer, Succeeds());
    EXPECT_TRUE(*answer);
    EXPECT_THAT(manager->createReplacementDirectory(file), FailsWith(EACCES, volume / "folder"));
}

// The kernel does not report the file system's abilities for it; its directory still allows a replacement.
TEST_F(Cloning, IsProbedForAnotherUsersReadOnlyFile) {
    const Volume volume("xfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    if (!isSuperuser()) GTEST_SKIP() << "only the superuser can make another user's file";
    makeDirectory(volume / "folder");
    setMode(std::filesystem::path(volume.path()).parent_path(), 0755);
    giveToOrdinaryUser(volume / "folder");
    writeFile(volume / "folder/file", irregularBytes(5000));
    setMode(volume / "folder/file", 0444);
    const AsOrdinaryUser user;
    const auto answer = manager->volumeSupportsCloning(URL::fileURLWithPath(volume / "folder/file"));
    ASSERT_THAT(answer, Succeeds());
    EXPECT_TRUE(*answer);
    EXPECT_THAT(namesIn(volume / "folder"), ElementsAre("file"));
}

TEST_F(Cloning, CannotBeProbedForASpecialFile) {
    makeDirectory(path("folder"));
    makeLink("folder", path("link"));
    makeFifo(path("fifo"));
    EXPECT_THAT(manager->volumeSupportsCloning(url("folder")), FailsWith(EISDIR, path("folder")));
    EXPECT_THAT(manager->volumeSupportsCloning(url("link")), FailsWith(ELOOP, path("link")));
    EXPECT_THAT(manager->volumeSupportsCloning(url("fifo")), FailsWith(EINVAL, path("fifo")));
    EXPECT_THAT(manager->volumeSupportsCloning(url("none")), FailsWith(ENOENT, path("none")));
}

}  // namespace
}  // namespace pinwell::test
