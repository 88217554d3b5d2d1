// New files, and files that take the place of others.
#include "ticket/file_writing.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>

#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

using foundation::asBytes;
using ticket_files::replaceFile;
using ticket_files::writeNewFile;

class TicketFiles : public testing::Test {
  protected:
    std::size_t filesThere() const {
        return static_cast<std::size_t>(
            std::distance(std::filesystem::directory_iterator(directory.path()), {}));
    }
    TemporaryDirectory directory;
    const std::string file = directory / "file";
};

TEST_F(TicketFiles, ThatAreNewOverwriteNothing) {
    ASSERT_TRUE(writeNewFile(asBytes("one"), file));
    EXPECT_EQ(readFile(file), "one");
    const auto again = writeNewFile(asBytes("two"), file);
    ASSERT_FALSE(again);
    EXPECT_EQ(again.error().code(), EEXIST);
    EXPECT_EQ(readFile(file), "one");
}

TEST_F(TicketFiles, ThatAreNewFollowNoLink) {
    std::filesystem::create_symlink("nowhere", file);
    EXPECT_FALSE(writeNewFile(asBytes("one"), file));
    EXPECT_FALSE(std::filesystem::exists(directory / "nowhere"));
}

TEST_F(TicketFiles, ReplaceAnExistingFileAndNotALinksTarget) {
    writeFile(directory / "precious", "precious");
    std::filesystem::create_symlink("precious", file);
    ASSERT_TRUE(replaceFile(asBytes("one"), file));
    EXPECT_EQ(readFile(file), "one");
    EXPECT_EQ(readFile(directory / "precious"), "precious");
    EXPECT_EQ(filesThere(), 2U);
}

TEST_F(TicketFiles, LeaveNothingWhenTheyCannotBeWritten) {
    writeFile(file, "old");
    std::filesystem::create_directory(directory / "folder");
    writeFile(directory / "folder/inside", "x");
    EXPECT_FALSE(replaceFile(asBytes("new"), directory / "folder"));
    EXPECT_FALSE(replaceFile(asBytes("new"), directory / "no/such"));
    EXPECT_FALSE(writeNewFile(asBytes("new"), directory / "no/such"));
    EXPECT_EQ(readFile(file), "old");
    EXPECT_EQ(filesThere(), 2U);
}

}  // namespace
}  // namespace pinwell::test
