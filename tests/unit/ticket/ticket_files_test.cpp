// New files, files that take the place of others, and the index of a directory of tickets.
#include "ticket/ticket_files.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>

#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

using base::asBytes;
using ticket_files::Index;
using ticket_files::IndexEntry;
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

const IndexEntry kEntry{
    .file = "2-2-ab.ticket", .sha256 = "00", .fetched = "2026-11-22T02:38:50Z", .revoked = false};

class TicketIndex : public testing::Test {
  protected:
    TemporaryDirectory directory;
    const std::string file = directory / "index.json";
};

TEST_F(TicketIndex, IsSortedByRecordName) {
    Index index;
    index.set("2/2/b", kEntry);
    index.set("2/2/a", kEntry);
    ASSERT_TRUE(index.write(directory.path()));
    EXPECT_EQ(
        readFile(file),
        R"({"version":1,"tickets":[{"recordName":"2/2/a","file":"2-2-ab.ticket","sha256":"00",)"
        R"("fetched":"2026-11-22T02:38:50Z","revoked":false},{"recordName":"2/2/b","file":"2-2-ab.ticket",)"
        R"("sha256":"00","fetched":"2026-11-22T02:38:50Z","revoked":false}]})"
        "\n");
}

TEST_F(TicketIndex, KeepsEarlierEntriesAndReplacesEntriesSetAgain) {
    Index first;
    first.set("2/2/a", kEntry);
    first.set("2/2/b", kEntry);
    ASSERT_TRUE(first.write(directory.path()));
    auto second = Index::read(directory.path());
    ASSERT_TRUE(second);
    IndexEntry revoked = kEntry;
    revoked.revoked = true;
    second->set("2/2/a", revoked);
    ASSERT_TRUE(second->write(directory.path()));
    EXPECT_THAT(readFile(file), testing::HasSubstr("\"revoked\":true},{\"recordName\":\"2/2/b\""));
}

TEST_F(TicketIndex, IsEmptyWhereNoneIs) {
    const auto index = Index::read(directory.path());
    ASSERT_TRUE(index);
    ASSERT_TRUE(index->write(directory.path()));
    EXPECT_EQ(readFile(file), "{\"version\":1,\"tickets\":[]}\n");
}

TEST_F(TicketIndex, ThatIsNoneOrOfALaterVersionIsRefused) {
    for (
        const char* contents :
        {"", "[]", "{}", "{\"version\":1}", "{\"version\":2,\"tickets\":[]}",
         "{\"version\":\"1\",\"tickets\":[]}", "{\"version\":1,\"tickets\":{}}",
         "{\"version\":1,\"tickets\":[1]}",
         R"({"version":1,"tickets":[{"recordName":"a","file":"b","sha256":"c","fetched":"d","revoked":"e"}]})"}) {
        writeFile(file, contents);
        EXPECT_FALSE(Index::read(directory.path())) << contents;
    }
}

}  // namespace
}  // namespace pinwell::test
