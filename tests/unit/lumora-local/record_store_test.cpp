#include "lumora-local/record_store.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <atomic>
#include <thread>

#include "lumora-local/failure.h"
#include "lumora-local/sha256.h"
#include "support/temporary_directory.h"

namespace pinwell::lumora {
namespace {

using foundation::Data;
using foundation::Date;
using pinwell::test::TemporaryDirectory;
using pinwell::test::writeFile;

constexpr Environment kProduction = Environment::production;

SignedRecord makeRecord(const std::string& name, std::string_view ticket) {
    return {{name,
             "Sample.app",
             {{2, Data(20, std::byte{1})}, {4, Data(48, std::byte{2})}},
             false,
             false,
             Date{77}},
            foundation::toData(ticket)};
}

class RecordStoreTest : public testing::Test {
  protected:
    RecordStoreTest() { RecordStore::create(path_); }

    const TemporaryDirectory directory_;
    const std::string path_ = directory_ / "records.sqlite";
};

TEST_F(RecordStoreTest, DeliversATicketInline) {
    RecordStore store(path_);
    store.put(kProduction, {makeRecord("a", "ticket")});
    const auto delivery = store.findTicket(kProduction, "a");
    ASSERT_TRUE(delivery);
    EXPECT_EQ(delivery->inlineTicket, foundation::toData("ticket"));
    EXPECT_FALSE(delivery->asset);
}

TEST_F(RecordStoreTest, DeliversATicketAsAnAsset) {
    RecordStore store(path_);
    SignedRecord record = makeRecord("a", "ticket");
    record.record.asAsset = true;
    store.put(kProduction, {record});
    const auto delivery = store.findTicket(kProduction, "a");
    ASSERT_TRUE(delivery && delivery->asset);
    EXPECT_FALSE(delivery->inlineTicket);
    EXPECT_EQ(delivery->asset->size, 6U);
    EXPECT_EQ(delivery->asset->identifier, foundation::toHex(sha256(foundation::toData("ticket"))));
    EXPECT_EQ(store.findAsset(delivery->asset->identifier), foundation::toData("ticket"));
}

TEST_F(RecordStoreTest, HasNoAssetForAnInlineTicket) {
    RecordStore store(path_);
    store.put(kProduction, {makeRecord("a", "ticket")});
    EXPECT_EQ(store.findAsset(foundation::toHex(sha256(foundation::toData("ticket")))), std::nullopt);
}

TEST_F(RecordStoreTest, WithdrawsTheAssetOfAReplacedRecord) {
    RecordStore store(path_);
    SignedRecord record = makeRecord("a", "ticket");
    record.record.asAsset = true;
    store.put(kProduction, {record});
    const std::string identifier = store.findTicket(kProduction, "a")->asset->identifier;
    store.put(kProduction, {makeRecord("a", "another")});
    EXPECT_EQ(store.findAsset(identifier), std::nullopt);
    EXPECT_EQ(store.findTicket(kProduction, "a")->inlineTicket, foundation::toData("another"));
}

TEST_F(RecordStoreTest, KnowsNothingOfOtherNames) {
    RecordStore store(path_);
    store.put(kProduction, {makeRecord("a", "ticket")});
    EXPECT_FALSE(store.findTicket(kProduction, "A"));
    EXPECT_FALSE(store.findTicket(kProduction, ""));
    EXPECT_FALSE(store.findTicket(kProduction, "a' OR '1'='1"));
    EXPECT_FALSE(store.findTicket(kProduction, std::string("a\0", 2)));
}

TEST_F(RecordStoreTest, KeepsTheEnvironmentsApart) {
    RecordStore store(path_);
    store.put(kProduction, {makeRecord("a", "ticket")});
    EXPECT_FALSE(store.findTicket(Environment::development, "a"));
    EXPECT_TRUE(store.list(Environment::development).empty());
}

TEST_F(RecordStoreTest, RemembersAllOfARecord) {
    RecordStore store(path_);
    SignedRecord entry = makeRecord("a", "ticket");
    entry.record.revoked = true;
    store.put(kProduction, {entry});
    const auto record = store.find(kProduction, "a");
    ASSERT_TRUE(record);
    EXPECT_EQ(record->label, "Sample.app");
    EXPECT_EQ(record->hashes, entry.record.hashes);
    EXPECT_TRUE(record->revoked);
    EXPECT_EQ(record->signedAt, Date{77});
    EXPECT_FALSE(store.find(kProduction, "b"));
}

TEST_F(RecordStoreTest, ListsByName) {
    RecordStore store(path_);
    store.put(kProduction, {makeRecord("b", "1"), makeRecord("a", "2")});
    const auto records = store.list(kProduction);
    ASSERT_EQ(records.size(), 2U);
    EXPECT_EQ(records[0].name, "a");
    EXPECT_EQ(records[1].name, "b");
    EXPECT_EQ(store.countRecords(), 2U);
}

TEST_F(RecordStoreTest, PutsAllOrNone) {
    RecordStore store(path_);
    SignedRecord broken = makeRecord("b", "");
    broken.ticket.clear();  // a blob of no bytes is bound as NULL, which the store does not take
    EXPECT_THROW(store.put(kProduction, {makeRecord("a", "ticket"), broken}), Failure);
    EXPECT_FALSE(store.findTicket(kProduction, "a"));
}

TEST_F(RecordStoreTest, ShowsAnOpenReaderWhatAnotherConnectionWrites) {
    RecordStore reader(path_);
    EXPECT_FALSE(reader.findTicket(kProduction, "a"));
    RecordStore(path_).put(kProduction, {makeRecord("a", "ticket")});
    EXPECT_TRUE(reader.findTicket(kProduction, "a"));
}

TEST_F(RecordStoreTest, LetsWritersTakeTurns) {
    constexpr int kWriters = 4;
    constexpr int kRecordsEach = 10;
    std::vector<std::thread> writers;
    for (int writer = 0; writer < kWriters; ++writer) {
        writers.emplace_back([this, writer] {
            RecordStore store(path_);
            for (int i = 0; i < kRecordsEach; ++i) {
                store.put(kProduction,
                          {makeRecord(std::to_string(writer) + "-" + std::to_string(i), "ticket")});
            }
        });
    }
    for (std::thread& writer : writers) writer.join();
    EXPECT_EQ(RecordStore(path_).countRecords(), std::size_t{kWriters * kRecordsEach});
}

TEST_F(RecordStoreTest, MayBeUsedFromSeveralThreads) {
    RecordStore store(path_);
    store.put(kProduction, {makeRecord("a", "ticket")});
    std::vector<std::thread> readers;
    std::atomic<int> found{0};
    for (int reader = 0; reader < 4; ++reader) {
        readers.emplace_back([&] {
            for (int i = 0; i < 50; ++i) found += store.findTicket(kProduction, "a") ? 1 : 0;
        });
    }
    for (std::thread& reader : readers) reader.join();
    EXPECT_EQ(found, 200);
}

TEST_F(RecordStoreTest, IsReadableByItsOwnerAlone) {
    struct stat status {};
    ASSERT_EQ(::stat(path_.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777U, 0600U);
}

TEST_F(RecordStoreTest, IsNotMadeOverAnotherFile) {
    EXPECT_THROW(RecordStore::create(path_), Failure);
}

TEST_F(RecordStoreTest, RefusesWhatIsNotAStore) {
    writeFile(directory_ / "garbage",
              "this is no database, and long enough that nobody could mistake it for one");
    writeFile(directory_ / "empty", "");
    EXPECT_THROW(RecordStore(directory_ / "garbage"), Failure);
    EXPECT_THROW(RecordStore(directory_ / "empty"), Failure);
    EXPECT_THROW(RecordStore(directory_ / "missing"), Failure);
}

}  // namespace
}  // namespace pinwell::lumora
