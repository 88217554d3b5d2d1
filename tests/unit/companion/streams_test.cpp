// Lists of paths, read while the paths are processed.
#include "companion/streams.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

using companion::PathList;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;
using State = PathList::State;

class PathLists : public testing::Test {
  protected:
    static std::vector<std::string> all(PathList& list) {
        std::vector<std::string> paths;
        for (auto entry = list.nextOrWait(); entry.state == State::path; entry = list.nextOrWait())
            paths.push_back(entry.path);
        return paths;
    }
    std::vector<std::string> read(const std::string& contents, bool isZeroTerminated = false,
                                  std::vector<std::string> before = {}) {
        writeFile(file, contents);
        auto list = PathList::open(std::move(before), file, isZeroTerminated);
        return all(*list);
    }
    TemporaryDirectory directory;
    const std::string file = directory / "list";
};

TEST_F(PathLists, HoldALineEach) {
    EXPECT_THAT(read("a\nb b\n\n\nc"), ElementsAre("a", "b b", "c"));
    EXPECT_THAT(read("a\n", false, {"x", "y"}), ElementsAre("x", "y", "a"));
    EXPECT_THAT(read(""), IsEmpty());
    EXPECT_THAT(read("\n\n"), IsEmpty());
}

TEST_F(PathLists, KeepEveryByteOfAPath) {
    EXPECT_THAT(read(" a \n\tb\r\n\xff\n"), ElementsAre(" a ", "\tb\r", "\xff"));
}

TEST_F(PathLists, EndPathsWithZeroBytesOnRequest) {
    EXPECT_THAT(read(std::string("a\nb\0\0c", 6), true), ElementsAre("a\nb", "c"));
}

TEST_F(PathLists, CutALineThatIsTooLongToNameAnything) {
    const auto paths = read(std::string(1'000'000, 'x') + "\nshort\n");
    ASSERT_THAT(paths, SizeIs(2));
    EXPECT_EQ(paths[0].size(), companion::kLongestPath);
    EXPECT_EQ(paths[1], "short");
}

TEST_F(PathLists, KeepALineAcrossTwoReads) {
    std::string contents;
    std::vector<std::string> expected;
    for (int i = 0; contents.size() < 300'000; ++i) {
        expected.push_back("path number " + std::to_string(i));
        contents += expected.back() + "\n";
    }
    EXPECT_EQ(read(contents), expected);
}

TEST_F(PathLists, NameAFileThatCannotBeOpened) {
    const auto list = PathList::open({}, directory / "missing", false);
    ASSERT_FALSE(list);
    EXPECT_THAT(list.error().localizedDescription(), testing::HasSubstr("missing"));
}

TEST_F(PathLists, OfAFolderAreBroken) {
    auto list = PathList::open({"a"}, directory.path(), false);
    ASSERT_TRUE(list);
    EXPECT_EQ(list->next().state, State::path);
    EXPECT_EQ(list->next().state, State::broken);
    EXPECT_TRUE(list->error());
}

TEST_F(PathLists, DoNotWaitForAPipe) {
    ASSERT_EQ(::mkfifo(file.c_str(), 0600), 0);
    auto list = PathList::open({}, file, false);
    ASSERT_TRUE(list);
    EXPECT_EQ(list->next().state, State::wait);
    {
        const base::FileDescriptor writer(::open(file.c_str(), O_WRONLY | O_CLOEXEC));
        ASSERT_TRUE(writer);
        ASSERT_EQ(::write(writer.get(), "a\nb", 3), 3);
        const auto first = list->next();
        EXPECT_EQ(first.state, State::path);
        EXPECT_EQ(first.path, "a");
        EXPECT_EQ(list->next().state, State::wait);
    }
    EXPECT_THAT(all(*list), ElementsAre("b"));
    EXPECT_EQ(list->next().state, State::end);
}

TEST(FileBeside, HasTheModeThatTheUsersMaskGives) {
    const TemporaryDirectory directory;
    const mode_t before = ::umask(027);
    const auto made = companion::makeFileBeside(directory / "report");
    EXPECT_EQ(::umask(before), 027U);
    ASSERT_TRUE(made);
    EXPECT_TRUE(made->path.starts_with((directory / "report") + ".")) << made->path;
    struct stat status {};
    ASSERT_EQ(::stat(made->path.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, 0640U);
}

TEST(FileBeside, NamesTheFileThatItCouldNotReplace) {
    const TemporaryDirectory directory;
    const auto made = companion::makeFileBeside(directory / "missing/report");
    ASSERT_FALSE(made);
    EXPECT_EQ(made.error(), base::Error::posix(ENOENT, directory / "missing/report"));
}

}  // namespace
}  // namespace pinwell::test
