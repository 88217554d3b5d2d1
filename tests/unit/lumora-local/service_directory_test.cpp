#include "lumora-local/service_directory.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "certificates.h"
#include "lumora-local/failure.h"
#include "lumora-local/sqlite_store.h"
#include "lumora-local/ticket_maker.h"
#include "support/temporary_directory.h"

namespace pinwell::lumora {
namespace {

using pinwell::test::readFile;
using pinwell::test::TemporaryDirectory;
using pinwell::test::writeFile;
using values::Date;

unsigned modeOf(const std::string& path) {
    struct stat status {};
    EXPECT_EQ(::stat(path.c_str(), &status), 0) << path;
    return status.st_mode & 07777U;
}

std::size_t entriesIn(const std::string& directory) {
    std::size_t count = 0;
    for ([[maybe_unused]] const auto& entry : std::filesystem::directory_iterator(directory)) ++count;
    return count;
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

class ServiceDirectoryTest : public testing::Test {
  protected:
    ServiceDirectory create(const NewService& service = {}) const {
        return ServiceDirectory::create(path_, service, Date::now());
    }

    const TemporaryDirectory parent_;
    const std::string path_ = parent_ / "service-under-test";
};

TEST_F(ServiceDirectoryTest, NamesItsHostForClients) {
    create();
    EXPECT_EQ(readFile(path_ + "/platform/platform.json"), "{\"lumora\":{\"host\":\"localhost:8443\"}}\n");
}

TEST_F(ServiceDirectoryTest, SendsClientsToTheFirstHostAndTheGivenPort) {
    const ServiceDirectory directory = create({{"tickets.example", "192.0.2.1"}, 9000});
    EXPECT_EQ(directory.advertisedEndpoint(), (Endpoint{"tickets.example", 9000}));
}

TEST_F(ServiceDirectoryTest, GivesClientsOnlyTheRoot) {
    create();
    EXPECT_EQ(entriesIn(path_ + "/platform/roots"), 1U);
    EXPECT_EQ(readFile(path_ + "/platform/roots/lumora-local.pem"), readFile(path_ + "/service/root.pem"));
    EXPECT_EQ(readFile(path_ + "/platform/roots/lumora-local.pem").find("PRIVATE"), std::string::npos);
}

TEST_F(ServiceDirectoryTest, NamesTheLoopbackHostsByDefault) {
    create();
    const auto server = lumora::test::certificateFromPem(readFile(path_ + "/service/server.pem"));
    ASSERT_NE(server, nullptr);
    EXPECT_EQ(X509_check_host(server.get(), "localhost", 0, X509_CHECK_FLAG_NEVER_CHECK_SUBJECT, nullptr), 1);
    EXPECT_EQ(X509_check_ip_asc(server.get(), "127.0.0.1", 0), 1);
    EXPECT_EQ(X509_check_ip_asc(server.get(), "::1", 0), 1);
}

TEST_F(ServiceDirectoryTest, IsReadableOnlyByItsOwner) {
    create();
    EXPECT_EQ(modeOf(path_ + "/service"), 0700U);
    for (const char* name :
         {"root.key", "ticket-intermediate.key", "ticket-signer.key", "server.key", "records.sqlite"}) {
        EXPECT_EQ(modeOf(path_ + "/service/" + name), 0600U) << name;
    }
    for (const auto& entry : std::filesystem::recursive_directory_iterator(path_ + "/platform")) {
        if (entry.is_regular_file()) {
            EXPECT_EQ(readFile(entry.path().string()).find("PRIVATE KEY"), std::string::npos);
        }
    }
}

TEST_F(ServiceDirectoryTest, LeavesAnExistingServiceUnchanged) {
    create();
    const std::string key = readFile(path_ + "/service/root.key");
    EXPECT_EQ(exitStatusOf([&] { create(); }), EX_CANTCREAT);
    EXPECT_EQ(readFile(path_ + "/service/root.key"), key);
    EXPECT_EQ(entriesIn(parent_.path()), 1U);
}

TEST_F(ServiceDirectoryTest, LeavesOtherFilesInItsPlaceUnchanged) {
    writeFile(path_, "a file");
    EXPECT_EQ(exitStatusOf([&] { create(); }), EX_CANTCREAT);
    EXPECT_EQ(readFile(path_), "a file");
    EXPECT_EQ(entriesIn(parent_.path()), 1U);
}

TEST_F(ServiceDirectoryTest, DoesNotFollowALinkInItsPlace) {
    std::filesystem::create_directory(parent_ / "elsewhere");
    std::filesystem::create_symlink("elsewhere", path_);
    EXPECT_EQ(exitStatusOf([&] { create(); }), EX_CANTCREAT);
    EXPECT_EQ(entriesIn(parent_ / "elsewhere"), 0U);
    EXPECT_EQ(entriesIn(parent_.path()), 2U);
}

TEST_F(ServiceDirectoryTest, MayReplaceAnEmptyDirectory) {
    std::filesystem::create_directory(path_);
    create();
    EXPECT_EQ(entriesIn(path_), 2U);
    EXPECT_EQ(entriesIn(parent_.path()), 1U);
}

TEST_F(ServiceDirectoryTest, AcceptsATrailingSlash) {
    ServiceDirectory::create(path_ + "/", {}, Date::now());
    EXPECT_EQ(ServiceDirectory::open(path_ + "/").hosts().size(), 3U);
}

TEST_F(ServiceDirectoryTest, LeavesNothingIfItCannotBeMade) {
    const std::string nowhere = parent_ / "missing/service";
    EXPECT_EQ(exitStatusOf([&] { ServiceDirectory::create(nowhere, {}, Date::now()); }), EX_CANTCREAT);
    EXPECT_EQ(entriesIn(parent_.path()), 0U);
    EXPECT_EQ(exitStatusOf([&] { create({{"no,host"}, 1}); }), EX_SOFTWARE);
    EXPECT_EQ(entriesIn(parent_.path()), 0U);
}

TEST_F(ServiceDirectoryTest, CanBeOpenedAndUsed) {
    create({{"localhost", "127.0.0.1"}, 1});
    const ServiceDirectory directory = ServiceDirectory::open(path_);
    EXPECT_EQ(directory.hosts(), (std::vector<std::string>{"localhost", "127.0.0.1"}));
    EXPECT_EQ(SqliteStore(directory.storePath()).countRecords(), 0U);
    const TicketSigner signer(directory.signerKeyPath(), directory.signerChainPaths());
    EXPECT_FALSE(signer.makeTicket({{{2, base::Data(20)}}, false, Date{1}}).empty());
}

TEST_F(ServiceDirectoryTest, IsNotOpenedIfThereIsNoService) {
    EXPECT_EQ(exitStatusOf([&] { ServiceDirectory::open(path_); }), EX_NOINPUT);
    EXPECT_EQ(exitStatusOf([&] { ServiceDirectory::open(parent_.path()); }), EX_NOINPUT);
}

TEST_F(ServiceDirectoryTest, IsNotOpenedWithADamagedDescription) {
    create();
    for (const char* text : {"", "[]", "{}", "{\"hosts\":[]}", "{\"hosts\":[1]}", "{\"hosts\":[\"a b\"]}",
                             "{\"hosts\":\"localhost\"}"}) {
        writeFile(path_ + "/service/service.json", text);
        EXPECT_EQ(exitStatusOf([&] { ServiceDirectory::open(path_); }), EX_CONFIG) << text;
    }
}

TEST_F(ServiceDirectoryTest, RewritesTheHostForClientsAndKeepsOtherMembers) {
    const ServiceDirectory directory = create();
    writeFile(path_ + "/platform/platform.json",
              R"({"lumora": {"host": "localhost", "note": 1}, "other": [2]})");
    directory.advertise({"::1", 4711});
    EXPECT_EQ(readFile(path_ + "/platform/platform.json"),
              "{\"lumora\":{\"host\":\"[::1]:4711\",\"note\":1},\"other\":[2]}\n");
    EXPECT_EQ(directory.advertisedEndpoint(), (Endpoint{"::1", 4711}));
    EXPECT_EQ(entriesIn(path_ + "/platform"), 2U);
}

TEST_F(ServiceDirectoryTest, UsesTheStandardPortByDefault) {
    const ServiceDirectory directory = create();
    writeFile(path_ + "/platform/platform.json", R"({"lumora": {"host": "localhost"}})");
    EXPECT_EQ(directory.advertisedEndpoint(), (Endpoint{"localhost", 443}));
}

TEST_F(ServiceDirectoryTest, ReportsAnUnusablePlatform) {
    const ServiceDirectory directory = create();
    for (const char* text : {"", "{", "{\"lumora\":{\"host\":\"a b\"}}", "{\"lumora\":{\"host\":1}}"}) {
        writeFile(path_ + "/platform/platform.json", text);
        EXPECT_EQ(exitStatusOf([&] { directory.advertisedEndpoint(); }), EX_CONFIG) << text;
    }
}

}  // namespace
}  // namespace pinwell::lumora
