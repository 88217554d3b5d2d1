#include <unistd.h>

#include "fixture.h"
#include "support/volume.h"

namespace pinwell::test {
namespace {

using files::URL;
using testing::ElementsAre;
using testing::MatchesRegex;

using ReplacementDirectory = FilesTest;

TEST_F(ReplacementDirectory, IsAFreshPrivateOneBesideTheFile) {
    writeFile(path("file"), "x");
    const auto first = manager->createReplacementDirectory(url("file"));
    const auto second = manager->createReplacementDirectory(url("file"));
    ASSERT_THAT(first, Succeeds());
    ASSERT_THAT(second, Succeeds());
    EXPECT_NE(first->path(), second->path());
    EXPECT_EQ(first->deletingLastPathComponent().path(), directory.path());
    EXPECT_THAT(first->lastPathComponent(), MatchesRegex("\\.pinwell-replacement-[A-Za-z0-9]{6}"));
    EXPECT_TRUE(S_ISDIR(statusOf(first->path()).st_mode));
    EXPECT_EQ(permissionsOf(first->path()), 0700U);
}

TEST_F(ReplacementDirectory, IsPrivateInADirectoryThatHandsDownItsGroup) {
    makeDirectory(path("shared"));
    writeFile(path("shared/file"), "x");
    setMode(path("shared"), 02777);
    const auto made = manager->createReplacementDirectory(url("shared/file"));
    ASSERT_THAT(made, Succeeds());
    EXPECT_EQ(permissionsOf(made->path()), 0700U);
}

TEST_F(ReplacementDirectory, IsNotHadForAFileThatIsNotThere) {
    EXPECT_THAT(manager->createReplacementDirectory(url("none")), FailsWith(ENOENT, path("none")));
}

TEST_F(ReplacementDirectory, IsNotHadWhereNothingMayBeWritten) {
    const AsOrdinaryUser user(directory.path());
    writeFile(path("closed/file"), "x");
    setMode(path("closed"), 0500);
    EXPECT_THAT(manager->createReplacementDirectory(url("closed/file")), FailsWith(EACCES, path("closed")));
    EXPECT_THAT(namesIn(path("closed")), ElementsAre("file"));
}

class Replacement : public FilesTest {
  protected:
    Replacement() {
        writeFile(path("original"), "old");
        writeFile(path("replacement"), "new");
    }

    auto replace() { return manager->replaceItem(url("original"), url("replacement")); }

    void expectUnchanged() {
        EXPECT_EQ(readFile(path("original")), "old");
        EXPECT_EQ(readFile(path("replacement")), "new");
    }
};

TEST_F(Replacement, LeavesTheNewContentsUnderTheOldNameAlone) {
    ASSERT_THAT(replace(), Succeeds());
    EXPECT_EQ(readFile(path("original")), "new");
    EXPECT_THAT(namesIn(directory.path()), ElementsAre("original"));
}

TEST_F(Replacement, FromItsDirectoryTakesTheDirectoryAway) {
    const auto made = manager->createReplacementDirectory(url("original"));
    ASSERT_THAT(made, Succeeds());
    const URL copy = made->appendingPathComponent("original");
    ASSERT_THAT(manager->copyItem(url("original"), copy), Succeeds());
    writeFile(copy.path(), "newest");
    ASSERT_THAT(manager->replaceItem(url("original"), copy), Succeeds());
    EXPECT_EQ(readFile(path("original")), "newest");
    EXPECT_THAT(namesIn(directory.path()), ElementsAre("original", "replacement"));
}

TEST_F(Replacement, LeavesItsDirectoryWhenSomethingElseIsInIt) {
    const auto made = manager->createReplacementDirectory(url("original"));
    ASSERT_THAT(made, Succeeds());
    const URL copy = made->appendingPathComponent("original");
    writeFile(copy.path(), "newest");
    writeFile(made->appendingPathComponent("more").path(), "x");
    ASSERT_THAT(manager->replaceItem(url("original"), copy), Succeeds());
    EXPECT_THAT(namesIn(made->path()), ElementsAre("more"));
}

TEST_F(Replacement, LeavesADirectoryThatIsNotOneOfOurs) {
    writeFile(path("folder/replacement"), "newest");
    ASSERT_THAT(manager->replaceItem(url("original"), url("folder/replacement")), Succeeds());
    EXPECT_THAT(namesIn(path("folder")), ElementsAre());
}

TEST_F(Replacement, KeepsTheOriginalsModeAttributesAndList) {
    setAttribute(path("original"), "user.origin", "somewhere");
    setAttribute(path("original"), kAccessControlList, listThatLetsAnotherRead());
    setAttribute(path("replacement"), "user.other", "elsewhere");
    setMode(path("replacement"), 0777);
    const mode_t mode = permissionsOf(path("original"));
    ASSERT_THAT(replace(), Succeeds());
    EXPECT_EQ(permissionsOf(path("original")), mode);
    EXPECT_EQ(attribute(path("original"), "user.origin"), "somewhere");
    EXPECT_EQ(attribute(path("original"), kAccessControlList), listThatLetsAnotherRead());
    EXPECT_EQ(attribute(path("original"), "user.other"), std::nullopt);
}

TEST_F(Replacement, OfAReadOnlyFileStaysReadOnly) {
    const AsOrdinaryUser user(directory.path());
    writeFile(path("mine"), "old");
    writeFile(path("mine.new"), "new");
    setAttribute(path("mine"), "user.origin", "somewhere");
    setMode(path("mine"), 0444);
    setMode(path("mine.new"), 0444);
    ASSERT_THAT(manager->replaceItem(url("mine"), url("mine.new")), Succeeds());
    EXPECT_EQ(permissionsOf(path("mine")), 0444U);
    EXPECT_EQ(attribute(path("mine"), "user.origin"), "somewhere");
}

TEST_F(Replacement, KeepsTheOriginalsOwnerWhenTheSuperuserMakesIt) {
    if (!isSuperuser()) GTEST_SKIP() << "only the superuser may give files away";
    ASSERT_EQ(chown(path("original").c_str(), 1234, 2345), 0);
    ASSERT_THAT(replace(), Succeeds());
    EXPECT_EQ(statusOf(path("original")).st_uid, 1234U);
    EXPECT_EQ(statusOf(path("original")).st_gid, 2345U);
}

TEST_F(Replacement, LeavesTheOldContentsToTheOriginalsOtherNames) {
    ASSERT_EQ(link(path("original").c_str(), path("other name").c_str()), 0);
    ASSERT_THAT(replace(), Succeeds());
    EXPECT_EQ(readFile(path("other name")), "old");
    EXPECT_EQ(statusOf(path("other name")).st_nlink, 1U);
}

TEST_F(Replacement, TakesNamesThatAreNotUTF8AndNamesOf255Bytes) {
    const std::string longest(255, 'n');
    writeFile(path(longest), "old");
    writeFile(path("\xC3\x28"), "new");
    ASSERT_THAT(manager->replaceItem(url(longest), url("\xC3\x28")), Succeeds());
    EXPECT_EQ(readFile(path(longest)), "new");
}

TEST_F(Replacement, RefusesADirectoryALinkAndAFIFOOnEitherSide) {
    makeDirectory(path("folder"));
    makeLink("original", path("link"));
    makeFifo(path("fifo"));
    for (const auto& [name, reason] : {std::pair{"folder", EISDIR}, {"link", ELOOP}, {"fifo", EINVAL}}) {
        EXPECT_THAT(manager->replaceItem(url(name), url("replacement")), FailsWith(reason, path(name)));
        EXPECT_THAT(manager->replaceItem(url("original"), url(name)), FailsWith(reason, path(name)));
        EXPECT_TRUE(exists(path(name)));
    }
    expectUnchanged();
}

TEST_F(Replacement, RefusesTwoNamesOfOneFile) {
    ASSERT_EQ(link(path("original").c_str(), path("same").c_str()), 0);
    EXPECT_THAT(manager->replaceItem(url("original"), url("same")), FailsWith(EINVAL, path("same")));
    EXPECT_THAT(manager->replaceItem(url("original"), url("original")), FailsWith(EINVAL, path("original")));
    expectUnchanged();
}

TEST_F(Replacement, NeedsBothFiles) {
    EXPECT_THAT(manager->replaceItem(url("none"), url("replacement")), FailsWith(ENOENT, path("none")));
    EXPECT_THAT(manager->replaceItem(url("original"), url("none")), FailsWith(ENOENT, path("none")));
    expectUnchanged();
}

TEST_F(Replacement, AcrossVolumesFails) {
    const Volume volume("tmpfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    writeFile(volume / "replacement", "new");
    EXPECT_THAT(manager->replaceItem(url("original"), URL::fileURLWithPath(volume / "replacement")),
                FailsWith(EXDEV, path("original")));
    EXPECT_EQ(readFile(path("original")), "old");
    EXPECT_EQ(readFile(volume / "replacement"), "new");
}

TEST_F(Replacement, InADirectoryThatMayNotBeWrittenFails) {
    const AsOrdinaryUser user(directory.path());
    writeFile(path("closed/original"), "old");
    writeFile(path("mine"), "new");
    setMode(path("closed"), 0500);
    EXPECT_THAT(manager->replaceItem(url("closed/original"), url("mine")),
                FailsWith(EACCES, path("closed/original")));
    EXPECT_EQ(readFile(path("closed/original")), "old");
    EXPECT_EQ(readFile(path("mine")), "new");
}

TEST_F(Replacement, OfACloneOnAVolumeThatClones) {
    const Volume volume("xfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    const std::string contents = irregularBytes(1'000'000);
    writeFile(volume / "original", contents);
    setMode(volume / "original", 0640);
    const URL original = URL::fileURLWithPath(volume / "original");
    const auto made = manager->createReplacementDirectory(original);
    ASSERT_THAT(made, Succeeds());
    const URL copy = made->appendingPathComponent("original");
    ASSERT_THAT(manager->copyItem(original, copy), Succeeds());
    {
        const auto handle = manager->openForUpdating(copy);
        ASSERT_THAT(handle, Succeeds());
        (*handle)->seekToEnd();
        (*handle)->write(base::asBytes("more"));
    }
    EXPECT_EQ(readFile(volume / "original"), contents);
    ASSERT_THAT(manager->replaceItem(original, copy), Succeeds());
    EXPECT_EQ(readFile(volume / "original"), contents + "more");
    EXPECT_EQ(permissionsOf(volume / "original"), 0640U);
    EXPECT_THAT(namesIn(volume.path()), ElementsAre("original"));
}

}  // namespace
}  // namespace pinwell::test
