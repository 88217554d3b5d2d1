#include <fcntl.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <array>

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

}  // namespace
}  // namespace pinwell::test
