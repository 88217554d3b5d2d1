// The journal of a batch, line by line.
#include "batch/journal.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "src/DownloadDelegate.h"
#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

using batch::Journal;
using batch::JournalItem;
using retrieval::Cause;

const std::string kFirst = "pinwell-batch journal 1\n";
const std::string kState = "10,20.30,40.50,60";

JournalItem staple(const std::string& path, const std::string& state = kState) {
    return {.path = path, .operation = kOperationStaple, .filesState = state, .recordName = "2/2/ab"};
}

JournalItem validation(const std::string& path) {
    JournalItem item = staple(path);
    item.operation = kOperationValidate;
    return item;
}

base::Result<void> addWorked(Journal&& journal, const JournalItem& item) {
    return journal.add(item, 0, Cause::worked);
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
    /// Whether a run that begins now would skip it.
    bool hasDone(const JournalItem& item) const { return opened().hasDone(item); }
    TemporaryDirectory directory;
    const std::string file = directory / "journal";
};

TEST_F(Journals, KeepSuccesses) {
    ASSERT_TRUE(addWorked(opened(), staple("/a b%\n.dmg")));
    EXPECT_EQ(readFile(file), kFirst + "0 worked staple 10,20.30,40.50,60 2/2/ab /a%20b%25%0A.dmg\n");
    EXPECT_TRUE(hasDone(staple("/a b%\n.dmg")));
    EXPECT_FALSE(hasDone(staple("/a")));
    EXPECT_FALSE(hasDone(validation("/a b%\n.dmg")));
}

TEST_F(Journals, DistinguishTheFileAtAPathFromAnEarlierOne) {
    ASSERT_TRUE(addWorked(opened(), staple("/a")));
    for (const char* state : {"11,20.30,40.50,60", "10,20.31,40.50,60", "10,20.30,40.51,60",
                              "10,20.30,40.50,61", "", "-", "10,20.30,40.50,60+1,2.3,4.5,6"})
        EXPECT_FALSE(hasDone(staple("/a", state))) << state;
    JournalItem other = staple("/a");
    other.recordName = "2/2/ac";
    EXPECT_FALSE(hasDone(other));
}

TEST_F(Journals, ForgetArtefactsThatFailedLater) {
    Journal journal = opened();
    ASSERT_TRUE(journal.add(staple("/a"), 0, Cause::worked));
    ASSERT_TRUE(journal.add(staple("/a"), 65, Cause::notIssued));
    EXPECT_FALSE(hasDone(staple("/a")));
    ASSERT_TRUE(journal.add(staple("/a", "other"), 0, Cause::worked));
    EXPECT_TRUE(hasDone(staple("/a", "other")));
    EXPECT_FALSE(hasDone(staple("/a")));
}

TEST_F(Journals, TreatUnknownArtefactsAsNotDone) {
    Journal journal = opened();
    ASSERT_TRUE(journal.add(staple("/a", ""), 0, Cause::worked));
    JournalItem nameless = staple("/b");
    nameless.recordName.clear();
    ASSERT_TRUE(journal.add(nameless, 0, Cause::worked));
    EXPECT_FALSE(hasDone(staple("/a", "")));
    EXPECT_FALSE(hasDone(staple("/a", "-")));
    EXPECT_FALSE(hasDone(nameless));
}

TEST_F(Journals, BeginAnewAfterTheEndOfARun) {
    Journal journal = opened();
    ASSERT_TRUE(journal.add(validation("/a"), 0, Cause::worked));
    ASSERT_TRUE(journal.add(staple("/a"), 0, Cause::worked));
    ASSERT_TRUE(journal.end(kOperationValidate));
    EXPECT_THAT(readFile(file), testing::EndsWith("\nended validate\n"));
    EXPECT_FALSE(hasDone(validation("/a")));
    EXPECT_TRUE(hasDone(staple("/a"))) << "another operation's";
    ASSERT_TRUE(journal.add(validation("/a"), 0, Cause::worked));
    EXPECT_TRUE(hasDone(validation("/a")));
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
    const std::string good = "0 worked staple 10,20.30,40.50,60 2/2/ab /good\n";
    for (const std::string& line :
         {std::string(""), std::string(" "), std::string("ended"), std::string("ended staples"),
          std::string("ended staple "), std::string(" ended staple"),
          std::string("0 worked staple 10,20.30,40.50,60 2/2/ab"),
          std::string("0 worked staple 10,20.30,40.50,60 2/2/ab /bad more"),
          std::string("0 worked stapel 10,20.30,40.50,60 2/2/ab /bad"),
          std::string("0 worked staple 10 20.30 2/2/ab /bad"), std::string("0 worked staple  2/2/ab /bad"),
          std::string("0  worked staple 10,20.30,40.50,60 2/2/ab /bad"),
          std::string("9 worked staple 10,20.30,40.50,60 2/2/ab /bad"),
          std::string("0 revoked staple 10,20.30,40.50,60 2/2/ab /bad"),
          "0 worked staple 10,20.30,40.50,60 2/2/ab /" + std::string(100'000, 'x')}) {
        ASSERT_TRUE(opensWith(kFirst + good + line + "\n")) << line.substr(0, 60);
        EXPECT_FALSE(hasDone(staple("/bad"))) << line.substr(0, 60);
        EXPECT_TRUE(hasDone(staple("/good"))) << line.substr(0, 60);
    }
}

TEST_F(Journals, EndALineThatWasCutShortBeforeTheyGoOn) {
    writeFile(file, kFirst + "0 worked staple 10,20.30,40.50,60 2/2/a");
    ASSERT_TRUE(addWorked(opened(), staple("/a")));
    EXPECT_TRUE(hasDone(staple("/a")));
}

}  // namespace
}  // namespace pinwell::test
