#include <filesystem>

#include "fixture.h"
#include "support/volume.h"

namespace pinwell::test {
namespace {

using files::URL;
using testing::ElementsAre;

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
