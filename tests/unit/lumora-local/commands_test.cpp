#include "lumora-local/commands.h"

#include <gtest/gtest.h>

#include <map>

#include "base/byte_io.h"
#include "base/bytes.h"
#include "lumora-local/failure.h"
#include "lumora-local/service_directory.h"
#include "lumora-local/sqlite_store.h"
#include "support/temporary_directory.h"
#include "values/date.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using base::ByteReader;
using base::Data;
using pinwell::test::TemporaryDirectory;
using values::Date;

/// Artefacts by path, without any files.
class FakeHasher final : public ArtefactHasher {
  public:
    Artefact examine(const std::string& path) override {
        const auto found = artefacts.find(path);
        if (found == artefacts.end()) throw Failure(EX_NOINPUT, "there is no such file");
        return found->second;
    }

    std::map<std::string, Artefact> artefacts;
};

CodeHash hashOf(std::uint32_t algorithm, int fill) {
    return {algorithm, Data(*hashLength(algorithm), static_cast<std::byte>(fill))};
}

Artefact artefact(std::string label, const CodeHash& own, const std::vector<CodeHash>& others = {}) {
    return {std::move(label), own, listableHashes(own, others)};
}

IssueRequest artefacts(std::vector<std::string> paths, bool asAsset = false) {
    IssueRequest request;
    request.paths = std::move(paths);
    request.asAsset = asAsset;
    return request;
}

RevokeRequest subjects(std::vector<std::string> subjects) {
    RevokeRequest request;
    request.subjects = std::move(subjects);
    return request;
}

class CommandsTest : public testing::Test {
  protected:
    CommandsTest() {
        hasher_.artefacts["A.app"] = artefact("A.app", hashOf(2, 0xA1), {hashOf(4, 0xA2), hashOf(2, 0xA1)});
        hasher_.artefacts["b.dmg"] = artefact("b.dmg", hashOf(2, 0xB1));
    }

    template <class Work>
    int exitStatusOf(Work&& work) {
        try {
            work();
        } catch (const Failure& failure) {
            return failure.exitStatus();
        }
        return EX_OK;
    }

    /// The flags in the ticket that a lookup of the record returns.
    std::uint32_t deliveredFlags(const std::string& name) {
        const auto delivery = store_.findTicket(Environment::production, name);
        const Data ticket = delivery->inlineTicket ? *delivery->inlineTicket
                                                   : store_.findAsset(delivery->asset->identifier).value();
        ByteReader reader(ticket);
        reader.seek(8, "lengths");
        const std::uint32_t certificates = reader.le32("certificates");
        reader.seek(16U + certificates + 12U, "flags");
        return reader.le32("flags");
    }

    const TemporaryDirectory directory_;
    const ServiceDirectory service_ = ServiceDirectory::create(directory_ / "service", {}, Date::now());
    SqliteStore store_{service_.storePath()};
    const TicketSigner signer_{service_.signerKeyPath(), service_.signerChainPaths()};
    FakeHasher hasher_;
    const Registry registry_{
        store_, signer_, hasher_, Environment::production, "tester", [] { return Date{1'795'000'000}; }};
    const std::string nameOfA_ = recordName(hashOf(2, 0xA1));
    const std::string nameOfB_ = recordName(hashOf(2, 0xB1));
};

TEST_F(CommandsTest, IssuesARecordUnderTheArtefactsOwnHash) {
    const auto records = issue(registry_, artefacts({"A.app"}));
    ASSERT_EQ(records.size(), 1U);
    EXPECT_EQ(records[0].name, nameOfA_);
    EXPECT_EQ(records[0].label, "A.app");
    EXPECT_EQ(records[0].hashes, (std::vector<CodeHash>{hashOf(2, 0xA1), hashOf(4, 0xA2)}));
    EXPECT_EQ(records[0].signedAt, Date{1'795'000'000});
    EXPECT_EQ(store_.countRecords(), 1U);
    EXPECT_EQ(deliveredFlags(nameOfA_), 0U);
}

TEST_F(CommandsTest, DeliversAsAnAssetOnRequest) {
    EXPECT_TRUE(issue(registry_, artefacts({"A.app"}, true))[0].asAsset);
    EXPECT_TRUE(store_.findTicket(Environment::production, nameOfA_)->asset);
}

TEST_F(CommandsTest, DeliversLargeTicketsAsAssetsByDefault) {
    std::vector<CodeHash> many;
    for (std::uint32_t i = 0; i < 50'000; ++i) {
        CodeHash hash = hashOf(2, 0);
        for (std::size_t byte = 0; byte < 4; ++byte)
            hash.hash[byte] = static_cast<std::byte>(i >> (8 * byte));
        many.push_back(hash);
    }
    hasher_.artefacts["large"] = {"large", many.front(), many};
    EXPECT_TRUE(issue(registry_, artefacts({"large"}))[0].asAsset);
}

TEST_F(CommandsTest, IssuesAllOrNone) {
    EXPECT_EQ(exitStatusOf([&] { issue(registry_, artefacts({"A.app", "missing"})); }), EX_NOINPUT);
    EXPECT_EQ(store_.countRecords(), 0U);
}

TEST_F(CommandsTest, IssuesInAnEnvironment) {
    const Registry development{store_, signer_, hasher_, Environment::development, "tester", Date::now};
    issue(development, artefacts({"A.app"}));
    EXPECT_FALSE(store_.find(Environment::production, nameOfA_));
    EXPECT_TRUE(store_.find(Environment::development, nameOfA_));
}

TEST_F(CommandsTest, RevokesByNameAndByPath) {
    issue(registry_, artefacts({"A.app", "b.dmg"}));
    const auto records = revoke(registry_, subjects({nameOfA_, "b.dmg"}));
    ASSERT_EQ(records.size(), 2U);
    EXPECT_TRUE(records[0].revoked && records[1].revoked);
    EXPECT_EQ(deliveredFlags(nameOfA_), 1U);
    EXPECT_EQ(deliveredFlags(nameOfB_), 1U);
}

TEST_F(CommandsTest, KeepsTheDeliveryAndTheHashesOfARevokedRecord) {
    issue(registry_, artefacts({"A.app"}, true));
    const auto records = revoke(registry_, subjects({nameOfA_}));
    EXPECT_TRUE(records[0].asAsset);
    EXPECT_EQ(records[0].hashes.size(), 2U);
    EXPECT_EQ(deliveredFlags(nameOfA_), 1U);
}

TEST_F(CommandsTest, RevokesAllOrNone) {
    issue(registry_, artefacts({"A.app"}));
    EXPECT_EQ(exitStatusOf([&] { revoke(registry_, subjects({nameOfA_, "b.dmg"})); }), EX_DATAERR);
    EXPECT_EQ(exitStatusOf([&] { revoke(registry_, subjects({nameOfA_, nameOfB_})); }), EX_DATAERR);
    EXPECT_EQ(exitStatusOf([&] { revoke(registry_, subjects({nameOfA_, "missing"})); }), EX_NOINPUT);
    EXPECT_EQ(deliveredFlags(nameOfA_), 0U);
}

TEST_F(CommandsTest, DoesNotReissueARevokedArtefact) {
    issue(registry_, artefacts({"A.app"}));
    revoke(registry_, subjects({"A.app"}));
    EXPECT_EQ(exitStatusOf([&] { issue(registry_, artefacts({"b.dmg", "A.app"})); }), EX_DATAERR);
    EXPECT_EQ(deliveredFlags(nameOfA_), 1U);
    EXPECT_FALSE(store_.find(Environment::production, nameOfB_));
}

TEST_F(CommandsTest, ReinstatesARevokedArtefactOnRequest) {
    issue(registry_, artefacts({"A.app"}));
    revoke(registry_, subjects({"A.app"}));
    IssueRequest request = artefacts({"A.app"});
    request.reinstates = true;
    request.comment = "a false alarm";
    EXPECT_FALSE(issue(registry_, request)[0].revoked);
    EXPECT_EQ(deliveredFlags(nameOfA_), 0U);
}

TEST_F(CommandsTest, IssuesForARecordByName) {
    IssueRequest request;
    request.recordNames = {nameOfB_};
    request.label = "huge.dmg";
    const auto records = issue(registry_, request);
    ASSERT_EQ(records.size(), 1U);
    EXPECT_EQ(records[0].label, "huge.dmg");
    EXPECT_EQ(records[0].hashes, (std::vector<CodeHash>{hashOf(2, 0xB1)}));
    EXPECT_EQ(deliveredFlags(nameOfB_), 0U);
}

TEST_F(CommandsTest, RefusesAnInvalidRecordName) {
    IssueRequest request;
    request.recordNames = {"2/2/AB"};
    EXPECT_EQ(exitStatusOf([&] { issue(registry_, request); }), EX_USAGE);
}

TEST_F(CommandsTest, LogsActorAndReasonOfARevocation) {
    issue(registry_, artefacts({"A.app"}));
    revoke(registry_, {{"A.app"}, Reason::superseded, "2.0 is out"});
    std::vector<Event> events;
    store_.forEachEvent({}, [&](const Event& event) { events.push_back(event); });
    ASSERT_EQ(events.size(), 2U);
    EXPECT_EQ(events[1].actor, "tester");
    EXPECT_EQ(events[1].reason, Reason::superseded);
    EXPECT_EQ(events[1].comment, "2.0 is out");
    EXPECT_EQ(events[1].time, Date{1'795'000'000});
}

TEST_F(CommandsTest, ListsARecordOnALine) {
    issue(registry_, artefacts({"A.app", "b.dmg"}));
    revoke(registry_, subjects({"b.dmg"}));
    EXPECT_EQ(describeRecords(store_.list(Environment::production)),
              "valid\t" + nameOfA_ + "\tinline\t2026-11-18 11:06:40 +0000\t2\tA.app\n" + "revoked\t" +
                  nameOfB_ + "\tinline\t2026-11-18 11:06:40 +0000\t1\tb.dmg\n");
}

TEST_F(CommandsTest, ListsForPrograms) {
    hasher_.artefacts["odd"] = artefact("odd\n\xFF.app", hashOf(4, 3));
    issue(registry_, artefacts({"odd"}, true));
    const std::string text = recordsAsJson(store_.list(Environment::production));
    const auto document = values::parseJSON(base::asBytes(text));
    ASSERT_TRUE(document) << text;
    const auto& record = (*document)["records"][0];
    EXPECT_EQ(*record["recordName"].string(), recordName(hashOf(4, 3)));
    EXPECT_FALSE(record["revoked"].boolValue());
    EXPECT_TRUE(record["asset"].boolValue());
    EXPECT_EQ(record["signatureTime"].unsignedIntegerValue(), 1'795'000'000U);
    EXPECT_EQ(record["hashes"][0]["algorithm"].unsignedIntegerValue(), 4U);
    EXPECT_EQ(record["label"].string()->find('\n'), std::string::npos);
    EXPECT_EQ(recordsAsJson({}), "{\"records\":[]}\n");
}

}  // namespace
}  // namespace pinwell::lumora
