// The journal of a batch, line by line.
#include "batch/journal.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "src/DownloadDelegate.h"
#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

using batch::FileState;
using batch::Journal;
using batch::JournalEntry;
using retrieval::Cause;

const std::string kFirst = "pinwell-batch journal 1\n";
const FileState kState{10, 20, 30};

JournalEntry worked(const FileState& state = kState) {
    return {.exitStatus = 0,
            .cause = Cause::worked,
            .operation = kOperationStaple,
            .state = state,
            .recordName = "2/2/ab"};
}

class Journals : public testing::Test {
  protected:
    Journal opened() const {
        auto journal = Journal::open(file);
        EXPECT_TRUE(journal);
        return *std::move(journal);
    }
    bool opensWith(const std::string& contents) const {
        writeFile(file, contents);
        return Journal::open(file).asOptional().has_value();
    }
    std::optional<FileState> stateOf(const std::string& path) const {
        const Journal journal = opened();
        const JournalEntry* const entry = journal.find(path, kOperationStaple);
        return entry == nullptr ? std::nullopt : entry->state;
    }
    TemporaryDirectory directory;
    const std::string file = directory / "journal";
};

TEST_F(Journals, KeepWhatWorked) {
    ASSERT_TRUE(opened().add("/a b%\n.dmg", worked()));
    EXPECT_EQ(readFile(file), kFirst + "0 worked staple 10 20.30 2/2/ab /a%20b%25%0A.dmg\n");
    EXPECT_EQ(stateOf("/a b%\n.dmg"), kState);
    EXPECT_EQ(stateOf("/a"), std::nullopt);
    EXPECT_EQ(opened().find("/a b%\n.dmg", kOperationValidate), nullptr);
}

TEST_F(Journals, ForgetWhatFailedLater) {
    Journal journal = opened();
    ASSERT_TRUE(journal.add("/a", worked()));
    JournalEntry failed = worked();
    failed.exitStatus = 65;
    failed.cause = Cause::notIssued;
    ASSERT_TRUE(journal.add("/a", failed));
    EXPECT_EQ(stateOf("/a"), std::nullopt);
    ASSERT_TRUE(journal.add("/a", worked({11, 20, 30})));
    EXPECT_EQ(stateOf("/a"), (FileState{11, 20, 30}));
}

TEST_F(Journals, TakeWhatIsNotKnownForNotDone) {
    Journal journal = opened();
    JournalEntry entry = worked();
    entry.state = std::nullopt;
    ASSERT_TRUE(journal.add("/a", entry));
    entry = worked();
    entry.recordName.clear();
    ASSERT_TRUE(journal.add("/b", entry));
    EXPECT_EQ(stateOf("/a"), std::nullopt);
    EXPECT_EQ(stateOf("/b"), std::nullopt);
}

TEST_F(Journals, BeginWithTheirFirstLine) {
    for (std::size_t length = 0; length <= kFirst.size(); ++length) {
        EXPECT_TRUE(opensWith(kFirst.substr(0, length))) << length;
        EXPECT_EQ(readFile(file), kFirst);
    }
    for (const std::string& other :
         {std::string("x"), kFirst.substr(1), "\n" + kFirst, std::string("\0", 1)}) {
        EXPECT_FALSE(opensWith(other));
        EXPECT_EQ(readFile(file), other);
    }
}

TEST_F(Journals, PassOverLinesThatAreMalformed) {
    const std::string good = "0 worked staple 10 20.30 2/2/ab /good\n";
    for (const std::string& line :
         {std::string(""), std::string(" "), std::string("0 worked staple 10 20.30 2/2/ab"),
          std::string("0 worked staple 10 20.30 2/2/ab /bad more"),
          std::string("0 worked staple -1 20.30 2/2/ab /bad"),
          std::string("0 worked staple 10 20 2/2/ab /bad"),
          std::string("0 worked staple 10 20.x 2/2/ab /bad"),
          std::string("0  worked staple 10 20.30 2/2/ab /bad"),
          std::string("9 worked staple 10 20.30 2/2/ab /bad"),
          std::string("0 revoked staple 10 20.30 2/2/ab /bad"),
          std::string("0 worked staple 99999999999999999999 20.30 2/2/ab /bad"),
          "0 worked staple 10 20.30 2/2/ab /" + std::string(100'000, 'x')}) {
        ASSERT_TRUE(opensWith(kFirst + line + "\n" + good)) << line.substr(0, 60);
        EXPECT_EQ(stateOf("/bad"), std::nullopt) << line.substr(0, 60);
        EXPECT_EQ(stateOf("/good"), kState) << line.substr(0, 60);
    }
}

TEST_F(Journals, EndALineThatWasCutShortBeforeTheyGoOn) {
    writeFile(file, kFirst + "0 worked staple 10 20.30 2/2/a");
    ASSERT_TRUE(opened().add("/a", worked()));
    EXPECT_EQ(stateOf("/a"), kState);
}

}  // namespace
}  // namespace pinwell::test
