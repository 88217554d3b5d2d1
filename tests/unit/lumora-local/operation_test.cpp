// The service for its operator: readiness, logs, the service manager, backups, settings.
#include <SQLiteCpp/SQLiteCpp.h>
#include <gtest/gtest.h>
#include <httplib.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <array>
#include <filesystem>

#include "base/handle.h"
#include "lumora-local/failure.h"
#include "lumora-local/service_settings.h"
#include "running_service.h"
#include "support/environment.h"
#include "support/process.h"
#include "support/text.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using pinwell::test::linesOf;
using pinwell::test::readFile;
using pinwell::test::ScopedVariable;
using pinwell::test::TemporaryDirectory;
using pinwell::test::writeFile;
using test::Outcome;
using test::RunningService;
using test::runProgram;
using values::Value;

CodeHash sampleHash(int fill) {
    return {2, base::Data(20, static_cast<std::byte>(fill))};
}

std::string lookupOf(const std::string& name) {
    return R"({"records":[{"recordName":")" + name + R"("}]})";
}

Value parsed(const std::string& text) {
    auto value = values::parseJSON(base::asBytes(text));
    if (!value) throw std::runtime_error("no JSON: " + text);
    return *std::move(value);
}

TEST(Readiness, IsReportedWhileRecordsCanBeRead) {
    RunningService service;
    const auto ready = service.client()->Get("/readyz");
    ASSERT_TRUE(ready);
    EXPECT_EQ(ready->status, 200);
    EXPECT_EQ(ready->body, R"({"status":"ready"})");
    EXPECT_EQ(service.client()->Post("/readyz")->status, 405);
}

TEST(Readiness, IsDeniedAfterTheRecordsAreLost) {
    RunningService service;
    const std::string name = service.put(sampleHash(1));
    std::filesystem::rename(service.directory().storePath(), service.path() + "/elsewhere");
    const auto client = service.client();
    const auto expectUnavailable = [&](const httplib::Result& result) {
        ASSERT_TRUE(result);
        EXPECT_EQ(result->status, 503);
        EXPECT_EQ(result->get_header_value("Retry-After"), "1");
    };
    expectUnavailable(client->Get("/readyz"));
    expectUnavailable(client->Post(test::kLookupPath, lookupOf(name), "application/json"));
    std::filesystem::rename(service.path() + "/elsewhere", service.directory().storePath());
    EXPECT_EQ(client->Get("/readyz")->status, 200);
}

TEST(JsonLog, HasAnObjectForEachRequest) {
    RunningService service({}, R"({"hosts":["localhost","127.0.0.1"],"log":"json"})");
    const std::string name = service.put(sampleHash(1));
    const auto answer = service.client()->Post(test::kLookupPath, lookupOf(name), "application/json");
    ASSERT_TRUE(answer);
    service.client()->Get("/no%0Athing\xff");
    service.sendSignal(SIGTERM);
    EXPECT_EQ(service.wait(), 0);
    EXPECT_EQ(service.errors(), "");
    std::vector<Value> requests;
    for (const std::string& line : linesOf(service.output())) {
        const Value entry = parsed(line);
        EXPECT_TRUE(entry["time"].string()->ends_with("Z")) << line;
        if (*entry["message"].string() == "request") requests.push_back(entry);
    }
    ASSERT_EQ(requests.size(), 2U) << service.output();
    EXPECT_EQ(*requests[0]["request"].string(), answer->get_header_value("X-Ostrel-Request-UUID"));
    EXPECT_EQ(*requests[0]["records"][0].string(), name);
    EXPECT_EQ(requests[0]["status"].unsignedIntegerValue(), 200U);
    EXPECT_EQ(requests[0]["bytes"].unsignedIntegerValue(), answer->body.size());
    EXPECT_EQ(*requests[0]["method"].string(), "POST");
    EXPECT_EQ(requests[1]["status"].unsignedIntegerValue(), 404U);
}

/// The socket of the service manager.
class ManagerSocket {
  public:
    explicit ManagerSocket(const std::string& path)
        : socket_(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        path.copy(address.sun_path, sizeof address.sun_path - 1);
        if (::bind(socket_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
            throw std::runtime_error("cannot bind " + path);
        }
    }

    /// The next message, which must arrive.
    std::string next() const {
        std::array<char, 512> buffer{};
        const ssize_t count = ::recv(socket_.get(), buffer.data(), buffer.size(), 0);
        return {buffer.data(), count < 0 ? 0 : static_cast<std::size_t>(count)};
    }

  private:
    base::FileDescriptor socket_;
};

TEST(ServiceManagerMessages, ReportReadinessAndTheEnd) {
    const TemporaryDirectory directory;
    const ManagerSocket manager(directory / "notify");
    const ScopedVariable variable("NOTIFY_SOCKET", directory / "notify");
    RunningService service;
    EXPECT_TRUE(manager.next().starts_with("READY=1\nSTATUS=Serves lookups at https://127.0.0.1:"));
    service.sendSignal(SIGTERM);
    EXPECT_EQ(manager.next(), "STOPPING=1");
    EXPECT_EQ(service.wait(), 0);
}

TEST(ServiceManagerMessages, AreSentToAWatchdog) {
    const TemporaryDirectory directory;
    const ManagerSocket manager(directory / "notify");
    const ScopedVariable variable("NOTIFY_SOCKET", directory / "notify");
    const ScopedVariable interval("WATCHDOG_USEC", "20000");
    RunningService service;
    EXPECT_TRUE(manager.next().starts_with("READY=1\n"));
    EXPECT_EQ(manager.next(), "WATCHDOG=1");
    EXPECT_EQ(manager.next(), "WATCHDOG=1");
}

TEST(ServiceManagerMessages, AreOptional) {
    for (const char* address : {"", "relative", "/nowhere/at/all", "@nobody-listens-here"}) {
        const ScopedVariable variable("NOTIFY_SOCKET", address);
        RunningService service;
        EXPECT_EQ(service.client()->Get("/readyz")->status, 200) << address;
    }
}

class Backup : public testing::Test {
  protected:
    std::string file() const { return directory_ / "site.backup"; }
    std::string restored() const { return directory_ / "restored"; }

    static void expectFailure(const Outcome& outcome, int exitStatus) {
        EXPECT_EQ(outcome.exitStatus, exitStatus) << outcome.err;
        EXPECT_EQ(linesOf(outcome.err).size(), 1U) << outcome.err;
    }

    const TemporaryDirectory directory_;
};

TEST_F(Backup, OfARunningServiceBecomesTheSameService) {
    RunningService service;
    const std::string name = service.put(sampleHash(1));
    service.put(sampleHash(2), true);
    service.put(sampleHash(3), false, true);
    const Outcome made = runProgram({"backup", service.path(), file()});
    ASSERT_EQ(made.exitStatus, 0) << made.err;
    struct stat status {};
    ASSERT_EQ(::stat(file().c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777U, 0600U);
    service.put(sampleHash(4));  // afterwards

    const Outcome back = runProgram({"restore", file(), restored()});
    ASSERT_EQ(back.exitStatus, 0) << back.err;
    EXPECT_EQ(linesOf(runProgram({"list", restored()}).out).size(), 3U);
    EXPECT_EQ(runProgram({"log", restored(), "--verify"}).exitStatus, 0);
    EXPECT_EQ(runProgram({"check", restored()}).exitStatus, 0);
    for (const char* kept : {"/service/service.json", "/service/ticket-signer.key", "/service/server.pem",
                             "/platform/platform.json", "/platform/roots/lumora-local.pem"}) {
        EXPECT_EQ(readFile(restored() + kept), readFile(service.path() + kept)) << kept;
    }
    ASSERT_EQ(::stat((restored() + "/service/root.key").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777U, 0600U);
    ASSERT_EQ(::stat((restored() + "/service").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777U, 0700U);
    EXPECT_EQ(runProgram({"revoke", restored(), name}).exitStatus, 0);
}

TEST_F(Backup, ContainsTheFilesThatSettingsName) {
    RunningService service;
    ASSERT_EQ(runProgram({"rotate", service.path(), "signer"}).exitStatus, 0);
    ASSERT_EQ(runProgram({"rotate", service.path(), "server"}).exitStatus, 0);
    ASSERT_EQ(runProgram({"backup", service.path(), file()}).exitStatus, 0);
    ASSERT_EQ(runProgram({"restore", file(), restored()}).exitStatus, 0);
    EXPECT_EQ(runProgram({"check", restored()}).exitStatus, 0);
}

TEST_F(Backup, OverwritesNothing) {
    RunningService service;
    writeFile(file(), "precious");
    expectFailure(runProgram({"backup", service.path(), file()}), 73);
    EXPECT_EQ(readFile(file()), "precious");
    std::filesystem::remove(file());
    ASSERT_EQ(runProgram({"backup", service.path(), file()}).exitStatus, 0);
    expectFailure(runProgram({"restore", file(), service.path()}), 73);
    expectFailure(runProgram({"backup", service.path(), directory_ / "missing/file"}), 73);
    std::size_t entries = 0;
    for ([[maybe_unused]] const auto& entry : std::filesystem::directory_iterator(directory_.path()))
        ++entries;
    EXPECT_EQ(entries, 1U) << "nothing unfinished is left";
}

TEST_F(Backup, IsNotMadeIfItCouldNotBeRestored) {
    RunningService service;
    for (const char* name : {"service/a/b/c/deep.pem", "service/old/records.sqlite-copy"}) {
        const std::filesystem::path path = std::filesystem::path(service.path()) / name;
        std::filesystem::create_directories(path.parent_path());
        writeFile(path, "text");
        const Outcome outcome = runProgram({"backup", service.path(), file()});
        expectFailure(outcome, 65);
        EXPECT_NE(outcome.err.find(std::string(name) + " has no place in a backup"), std::string::npos)
            << outcome.err;
        EXPECT_FALSE(std::filesystem::exists(file()));
        std::filesystem::remove(path);
    }
    EXPECT_EQ(runProgram({"backup", service.path(), file()}).exitStatus, 0);
}

TEST_F(Backup, IsRefusedUnlessItIsWholeAndHarmless) {
    RunningService service;
    expectFailure(runProgram({"restore", directory_ / "absent", restored()}), 66);
    expectFailure(runProgram({"restore", directory_.path(), restored()}), 66);
    writeFile(file(), "no database");
    expectFailure(runProgram({"restore", file(), restored()}), 65);
    std::filesystem::copy_file(service.directory().storePath(), directory_ / "records");
    expectFailure(runProgram({"restore", directory_ / "records", restored()}), 65);

    std::filesystem::remove(file());
    ASSERT_EQ(runProgram({"backup", service.path(), file()}).exitStatus, 0);
    for (const char* change :
         {"UPDATE sqlar SET name = '../outside' WHERE name = 'platform/platform.json'",
          "UPDATE sqlar SET name = '/outside' WHERE name = 'platform/platform.json'",
          "UPDATE sqlar SET name = 'service/../../x' WHERE name = 'platform/platform.json'",
          "UPDATE sqlar SET name = 'service/records.sqlite-wal' WHERE name = 'service/root.pem'",
          "UPDATE sqlar SET sz = 1", "DROP TABLE sqlar",
          "DELETE FROM sqlar WHERE name = 'service/service.json'", "DROP TABLE record"}) {
        const std::string spoiled = directory_ / "spoiled";
        std::filesystem::copy_file(file(), spoiled, std::filesystem::copy_options::overwrite_existing);
        SQLite::Database(spoiled, SQLite::OPEN_READWRITE).exec(change);
        const Outcome outcome = runProgram({"restore", spoiled, restored()});
        EXPECT_NE(outcome.exitStatus, 0) << change;
        EXPECT_EQ(linesOf(outcome.err).size(), 1U) << outcome.err;
        EXPECT_FALSE(std::filesystem::exists(restored())) << change;
    }
    EXPECT_FALSE(std::filesystem::exists(directory_ / "outside"));
}

TEST_F(Backup, FindsTheServiceInTheEnvironment) {
    RunningService service;
    {
        const ScopedVariable variable("LUMORA_DIR", service.path());
        ASSERT_EQ(runProgram({"backup", file()}).exitStatus, 0);
    }
    const ScopedVariable variable("LUMORA_DIR", restored());
    EXPECT_EQ(runProgram({"restore", file()}).exitStatus, 0);
    EXPECT_EQ(runProgram({"check"}).exitStatus, 0);
}

/// Whether the published schema accepts a document.
bool schemaTakes(const std::string& text) {
    const TemporaryDirectory directory;
    writeFile(directory / "document", text);
    return pinwell::test::runProcess({.executable = JSONSCHEMA_PROGRAM,
                                      .arguments = {"-i", directory / "document", SERVICE_SCHEMA}})
               .exitStatus == 0;
}

TEST(SettingsSchema, AgreesWithTheService) {
    if (!std::filesystem::exists(JSONSCHEMA_PROGRAM)) GTEST_SKIP() << "jsonschema is not installed";
    for (const char* text : {
             R"({"hosts":["localhost","127.0.0.1","::1"]})",
             R"({"hosts":["a.example"],"log":"json","role":"lookup","store":"postgresql:///lumora"})",
             R"({"hosts":["a"],"log":"xml"})",
             R"({"hosts":["a"],"role":"full"})",
             R"({"hosts":["a"],"store":"mysql://"})",
             R"({"hosts":["a"],"signer":{"key":"pkcs11:object=k","chain":["s","i","r"],"requested":"n"}})",
             R"({"hosts":["a"],"signer":{"requested":"n"}})",
             R"({"hosts":["a"],"signer":{"key":"k","requested":"n"}})",
             R"({"hosts":["a"],"signer":{"key":"k","chain":["s","i"]}})",
             R"({"hosts":["a"],"server":{"key":"k","certificate":"c"}})",
             R"({"hosts":["a"],"server":{"key":"pkcs11:a","certificate":"c"}})",
             R"({"hosts":["a"],"server":{"key":"k"}})",
             R"({"hosts":["a"],"passphraseFile":"credential:x"})",
             R"({"hosts":["a"],"passphraseFile":""})",
             R"({"hosts":["a"],"more":1})",
             R"({"hosts":[]})",
             R"({"hosts":["A"]})",
             R"({})",
             R"([])",
         }) {
        bool taken = true;
        try {
            parseServiceSettings(parsed(text), "service.json");
        } catch (const Failure&) {
            taken = false;
        }
        EXPECT_EQ(schemaTakes(text), taken) << text;
    }
}

}  // namespace
}  // namespace pinwell::lumora
