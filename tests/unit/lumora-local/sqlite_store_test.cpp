#include "lumora-local/sqlite_store.h"

#include <SQLiteCpp/SQLiteCpp.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <functional>

#include "lumora-local/failure.h"
#include "lumora-local/upkeep.h"
#include "sample_record.h"
#include "support/temporary_directory.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using pinwell::test::TemporaryDirectory;
using pinwell::test::writeFile;
using test::kOccasion;
using test::kProduction;
using test::makeRecord;
using values::Date;

class SqliteStoreTest : public testing::Test {
  protected:
    SqliteStoreTest() { SqliteStore::create(path_); }

    const TemporaryDirectory directory_;
    const std::string path_ = directory_ / "records.sqlite";
};

TEST_F(SqliteStoreTest, NeverChangesOrRemovesEvents) {
    SqliteStore(path_).put(kProduction, {makeRecord("a", "ticket")}, kOccasion);
    SQLite::Database database(path_, SQLite::OPEN_READWRITE);
    EXPECT_THROW(database.exec("UPDATE event SET comment = 'x'"), SQLite::Exception);
    EXPECT_THROW(database.exec("DELETE FROM event"), SQLite::Exception);
}

TEST_F(SqliteStoreTest, IsReadableOnlyByItsOwner) {
    struct stat status {};
    ASSERT_EQ(::stat(path_.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777U, 0600U);
}

TEST_F(SqliteStoreTest, IsNotMadeOverAnotherFile) {
    EXPECT_THROW(SqliteStore::create(path_), Failure);
}

int statusOf(const std::function<void()>& work) {
    try {
        work();
        return EX_OK;
    } catch (const Failure& failure) {
        return failure.exitStatus();
    }
}

TEST_F(SqliteStoreTest, HasTheExitStatusesOfBackups) {
    const std::string garbage = directory_ / "garbage";
    writeFile(garbage, std::string(4096, 'x'));
    EXPECT_EQ(statusOf([&] { SqliteStore store(garbage); }), EX_DATAERR);
    EXPECT_EQ(statusOf([&] { restore(garbage, directory_ / "restored"); }), EX_DATAERR);
    // A database, and not ours.
    SQLite::Database(path_, SQLite::OPEN_READWRITE).exec("DROP TABLE hash; DROP TABLE record");
    EXPECT_EQ(statusOf([&] { SqliteStore store(path_); }), EX_DATAERR);
    EXPECT_EQ(statusOf([&] { restore(path_, directory_ / "restored"); }), EX_DATAERR);
}

TEST_F(SqliteStoreTest, RefusesOtherFiles) {
    writeFile(directory_ / "garbage",
              "this is no database, and long enough that nobody could mistake it for one");
    writeFile(directory_ / "empty", "");
    EXPECT_THROW(SqliteStore(directory_ / "garbage"), Failure);
    EXPECT_THROW(SqliteStore(directory_ / "empty"), Failure);
    EXPECT_THROW(SqliteStore(directory_ / "missing"), Failure);
}

}  // namespace
}  // namespace pinwell::lumora
