#include <sys/resource.h>
#include <unistd.h>

#include <filesystem>

#include "fixture.h"

namespace pinwell::test {
namespace {

using testing::ElementsAre;

class Removal : public FilesTest {
  protected:
    auto remove(std::string_view name) { return manager->removeItem(url(name)); }
};

TEST_F(Removal, TakesAFile) {
    writeFile(path("file"), "x");
    writeFile(path("other"), "x");
    ASSERT_THAT(remove("file"), Succeeds());
    EXPECT_THAT(namesIn(directory.path()), ElementsAre("other"));
}

TEST_F(Removal, TakesOneOfTwoHardLinks) {
    writeFile(path("file"), "x");
    ASSERT_EQ(link(path("file").c_str(), path("other").c_str()), 0);
    ASSERT_THAT(remove("file"), Succeeds());
    EXPECT_EQ(readFile(path("other")), "x");
}

TEST_F(Removal, RemovesALinkAndNotItsTarget) {
    writeFile(path("folder/file"), "x");
    makeLink("folder", path("link"));
    ASSERT_THAT(remove("link"), Succeeds());
    EXPECT_THAT(namesIn(directory.path()), ElementsAre("folder"));
    EXPECT_TRUE(exists(path("folder/file")));
}

TEST_F(Removal, TakesAFIFOWithoutOpeningIt) {
    makeFifo(path("fifo"));
    ASSERT_THAT(remove("fifo"), Succeeds());
    EXPECT_FALSE(exists(path("fifo")));
}

TEST_F(Removal, TakesAnEmptyDirectory) {
    makeDirectory(path("folder"));
    ASSERT_THAT(remove("folder"), Succeeds());
    EXPECT_FALSE(exists(path("folder")));
}

TEST_F(Removal, TakesATreeAndFollowsNoLinkInIt) {
    writeFile(path("outside/file"), "x");
    for (const char* name : {"tree/a", "tree/b/c", "tree/b/d/e", "tree/b/d/\xFF", "tree/f/g"})
        writeFile(path(name), "x");
    makeDirectory(path("tree/empty"));
    makeLink("../../outside", path("tree/b/link"));
    makeLink(path("outside"), path("tree/link"));
    makeFifo(path("tree/b/fifo"));
    ASSERT_THAT(remove("tree"), Succeeds());
    EXPECT_THAT(namesIn(directory.path()), ElementsAre("outside"));
    EXPECT_TRUE(exists(path("outside/file")));
}

TEST_F(Removal, TakesATreeDeeperThanPathsAndOpenFilesGo) {
    constexpr int kDepth = 3000;
    const std::string start = std::filesystem::current_path();
    makeDirectory(path("tree"));
    ASSERT_EQ(chdir(path("tree").c_str()), 0);
    for (int i = 0; i < kDepth; ++i) {
        ASSERT_EQ(mkdir("deeper", 0755), 0);
        ASSERT_EQ(chdir("deeper"), 0);
    }
    ASSERT_EQ(chdir(start.c_str()), 0);

    rlimit before{};
    getrlimit(RLIMIT_NOFILE, &before);
    const rlimit few{64, before.rlim_max};
    setrlimit(RLIMIT_NOFILE, &few);
    const auto done = remove("tree");
    setrlimit(RLIMIT_NOFILE, &before);
    ASSERT_THAT(done, Succeeds());
    EXPECT_THAT(namesIn(directory.path()), ElementsAre());
}

TEST_F(Removal, TakesADirectoryOfManyFiles) {
    for (int i = 0; i < 3000; ++i)
        writeFile(path("tree/" + std::to_string(i % 7) + "/" + std::to_string(i)), "");
    ASSERT_THAT(remove("tree"), Succeeds());
    EXPECT_FALSE(exists(path("tree")));
}

TEST_F(Removal, FailsForAMissingItem) {
    EXPECT_THAT(remove("none"), FailsWith(ENOENT, path("none")));
}

TEST_F(Removal, NamesTheItemThatCouldNotBeRemoved) {
    const AsOrdinaryUser user(directory.path());
    writeFile(path("tree/closed/file"), "x");
    setMode(path("tree/closed"), 0500);
    EXPECT_THAT(remove("tree"), FailsWith(EACCES, path("tree/closed/file")));
    EXPECT_TRUE(exists(path("tree/closed/file")));
}

TEST_F(Removal, RefusesTheDirectoryAboveUnderItsRelativeName) {
    writeFile(path("folder/file"), "x");
    writeFile(path("other"), "x");
    EXPECT_THAT(remove("folder/.."), FailsWith(EINVAL, path("folder/..")));
    EXPECT_THAT(namesIn(directory.path()), ElementsAre("folder", "other"));
}

}  // namespace
}  // namespace pinwell::test
