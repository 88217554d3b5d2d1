#include "fixture.h"

namespace pinwell::test {
namespace {

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

}  // namespace
}  // namespace pinwell::test
