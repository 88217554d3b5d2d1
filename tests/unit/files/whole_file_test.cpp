#include <unistd.h>

#include "fixture.h"
#include "values/url.h"

namespace pinwell::test {
namespace {

using base::asBytes;
using files::FileManager;
using testing::ElementsAre;

using WholeFile = FilesTest;

TEST_F(WholeFile, IsReadByteForByte) {
    const std::string contents = irregularBytes(700'001);
    writeFile(path("file"), contents);
    const auto read = manager->contentsOfFile(url("file"));
    ASSERT_THAT(read, Succeeds());
    EXPECT_EQ(base::toString(*read), contents);
}

TEST_F(WholeFile, MayBeEmpty) {
    writeFile(path("file"), "");
    const auto read = manager->contentsOfFile(url("file"));
    ASSERT_THAT(read, Succeeds());
    EXPECT_TRUE(read->empty());
}

TEST_F(WholeFile, MayBeAsLongAsTheLimitAndNoLonger) {
    writeFile(path("file"), "");
    ASSERT_EQ(truncate(path("file").c_str(), files::kMaximumWholeFile), 0);
    const auto read = manager->contentsOfFile(url("file"));
    ASSERT_THAT(read, Succeeds());
    EXPECT_EQ(read->size(), files::kMaximumWholeFile);
    ASSERT_EQ(truncate(path("file").c_str(), files::kMaximumWholeFile + 1), 0);
    EXPECT_THAT(manager->contentsOfFile(url("file")), FailsWith(EFBIG, path("file")));
}

TEST_F(WholeFile, ThatClaimsNoLengthIsReadToItsEnd) {
    const auto read = manager->contentsOfFile(values::URL::fileURLWithPath("/proc/self/status"));
    ASSERT_THAT(read, Succeeds());
    EXPECT_FALSE(read->empty());
}

TEST_F(WholeFile, IsNoLinkDirectoryOrFIFO) {
    writeFile(path("file"), "x");
    makeLink("file", path("link"));
    makeFifo(path("fifo"));
    EXPECT_THAT(manager->contentsOfFile(url("link")), FailsWith(ELOOP, path("link")));
    EXPECT_THAT(manager->contentsOfFile(url("fifo")), FailsWith(EINVAL, path("fifo")));
    EXPECT_THAT(manager->contentsOfFile(directory.url(".")), FailsWith(EISDIR, directory.path()));
    EXPECT_THAT(manager->contentsOfFile(url("none")), FailsWith(ENOENT, path("none")));
}

TEST_F(WholeFile, IsNoDevice) {
    const auto read = manager->contentsOfFile(values::URL::fileURLWithPath("/dev/zero"));
    EXPECT_THAT(read, FailsWith(EINVAL, "/dev/zero"));
}

class Writing : public FilesTest, public testing::WithParamInterface<FileManager::Writing> {
  protected:
    auto write(std::string_view contents, std::string_view name) {
        return manager->writeFile(asBytes(contents), url(name), GetParam());
    }
};

INSTANTIATE_TEST_SUITE_P(Both, Writing,
                         testing::Values(FileManager::Writing::plain, FileManager::Writing::atomic),
                         [](const auto& test) {
                             return test.param == FileManager::Writing::plain ? "Plainly" : "Atomically";
                         });

TEST_P(Writing, MakesAPrivateFileWhateverTheMaskIs) {
    const mode_t before = umask(0477);
    const auto done = write("contents", "file");
    umask(before);
    ASSERT_THAT(done, Succeeds());
    EXPECT_EQ(readFile(path("file")), "contents");
    EXPECT_EQ(permissionsOf(path("file")), 0600U);
    EXPECT_THAT(namesIn(directory.path()), ElementsAre("file"));
}

TEST_P(Writing, OverAnOpenFileMakesItPrivateAndDropsALongerPast) {
    writeFile(path("file"), "something longer");
    setMode(path("file"), 0666);
    ASSERT_THAT(write("short", "file"), Succeeds());
    EXPECT_EQ(readFile(path("file")), "short");
    EXPECT_EQ(permissionsOf(path("file")), 0600U);
    EXPECT_THAT(namesIn(directory.path()), ElementsAre("file"));
}

TEST_P(Writing, NothingMakesAnEmptyFile) {
    ASSERT_THAT(write("", "file"), Succeeds());
    EXPECT_EQ(readFile(path("file")), "");
}

TEST_P(Writing, ManyBytesKeepsThemAll) {
    const std::string contents = irregularBytes(700'001);
    ASSERT_THAT(write(contents, "file"), Succeeds());
    EXPECT_EQ(readFile(path("file")), contents);
}

TEST_P(Writing, TakesNamesThatAreNotUTF8AndNamesOf255Bytes) {
    const std::string longest(255, 'n');
    ASSERT_THAT(write("a", "\xFF"), Succeeds());
    ASSERT_THAT(write("b", longest), Succeeds());
    EXPECT_EQ(readFile(path("\xFF")), "a");
    EXPECT_EQ(readFile(path(longest)), "b");
}

TEST_P(Writing, OverADirectoryFails) {
    makeDirectory(path("folder"));
    EXPECT_THAT(write("contents", "folder"), FailsWith(EISDIR, path("folder")));
    EXPECT_THAT(namesIn(directory.path()), ElementsAre("folder"));
}

TEST_P(Writing, WhereThereIsNoDirectoryFails) {
    const auto done = write("contents", "none/file");
    ASSERT_FALSE(done);
    EXPECT_EQ(done.error().code(), ENOENT);
}

TEST_P(Writing, WhereNothingMayBeWrittenFails) {
    const AsOrdinaryUser user(directory.path());
    makeDirectory(path("closed"), 0500);
    const auto done = write("contents", "closed/file");
    ASSERT_FALSE(done);
    EXPECT_EQ(done.error().code(), EACCES);
    EXPECT_THAT(namesIn(path("closed")), ElementsAre());
}

class PlainWriting : public FilesTest {
  protected:
    auto write(std::string_view contents, std::string_view name) {
        return manager->writeFile(asBytes(contents), url(name), FileManager::Writing::plain);
    }
};

TEST_F(PlainWriting, RefusesALink) {
    writeFile(path("target"), "precious");
    makeLink("target", path("link"));
    makeLink("nowhere", path("dangling"));
    EXPECT_THAT(write("contents", "link"), FailsWith(ELOOP, path("link")));
    EXPECT_THAT(write("contents", "dangling"), FailsWith(ELOOP, path("dangling")));
    EXPECT_EQ(readFile(path("target")), "precious");
    EXPECT_FALSE(exists(path("nowhere")));
}

TEST_F(PlainWriting, RefusesAFIFOWithoutWaitingForAReader) {
    makeFifo(path("fifo"));
    EXPECT_THAT(write("contents", "fifo"), FailsWith(EINVAL, path("fifo")));
}

TEST_F(PlainWriting, KeepsTheFileAndItsOtherNames) {
    writeFile(path("file"), "old");
    ASSERT_EQ(link(path("file").c_str(), path("other").c_str()), 0);
    ASSERT_THAT(write("new", "file"), Succeeds());
    EXPECT_EQ(readFile(path("other")), "new");
}

class AtomicWriting : public FilesTest {
  protected:
    auto write(std::string_view contents, std::string_view name) {
        return manager->writeFile(asBytes(contents), url(name), FileManager::Writing::atomic);
    }
};

TEST_F(AtomicWriting, ReplacesALinkAndNotItsTarget) {
    writeFile(path("target"), "precious");
    makeLink("target", path("link"));
    ASSERT_THAT(write("contents", "link"), Succeeds());
    EXPECT_EQ(readFile(path("target")), "precious");
    EXPECT_TRUE(S_ISREG(statusOf(path("link")).st_mode));
    EXPECT_EQ(readFile(path("link")), "contents");
}

TEST_F(AtomicWriting, ReplacesAFIFO) {
    makeFifo(path("fifo"));
    ASSERT_THAT(write("contents", "fifo"), Succeeds());
    EXPECT_EQ(readFile(path("fifo")), "contents");
}

TEST_F(AtomicWriting, LeavesTheOldContentsToOtherNames) {
    writeFile(path("file"), "old");
    ASSERT_EQ(link(path("file").c_str(), path("other").c_str()), 0);
    ASSERT_THAT(write("new", "file"), Succeeds());
    EXPECT_EQ(readFile(path("other")), "old");
}

}  // namespace
}  // namespace pinwell::test
