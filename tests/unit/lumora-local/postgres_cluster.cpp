#include "postgres_cluster.h"

#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <thread>
#include <vector>

#include "lumora-local/command_line.h"
#include "support/require.h"

namespace pinwell::lumora::test {
namespace {

using pinwell::test::Command;
using pinwell::test::ProcessResult;
using pinwell::test::require;
using pinwell::test::runProcess;

constexpr uid_t kNobody = 65534;
constexpr std::chrono::seconds kStartPatience{60};

/// The folder with the programs of the newest release; empty if there is none.
std::string programs() {
    int newest = 0;
    std::error_code ignored;
    for (const auto& entry : std::filesystem::directory_iterator("/usr/lib/postgresql", ignored)) {
        if (std::filesystem::exists(entry.path() / "bin/initdb", ignored)) {
            newest = std::max(newest, std::atoi(entry.path().filename().c_str()));
        }
    }
    return newest == 0 ? "" : "/usr/lib/postgresql/" + std::to_string(newest) + "/bin";
}

void mustSucceed(const Command& command, const char* step) {
    const ProcessResult result = runProcess(command);
    if (result.exitStatus != 0) throw std::runtime_error(std::string(step) + ": " + result.errors);
}

}  // namespace

std::optional<std::string> PostgresCluster::missing() {
    if (programs().empty()) return "PostgreSQL is not installed";
    return std::nullopt;
}

PostgresCluster& PostgresCluster::shared() {
    static PostgresCluster cluster;
    return cluster;
}

PostgresCluster::PostgresCluster() {
    makeFolders();
    mustSucceed(asOwner("initdb", {"--pgdata", path(), "--username", "postgres", "--auth", "trust",
                                   "--encoding", "UTF8", "--no-locale", "--no-sync"}),
                "initdb");
    start();
}

PostgresCluster::PostgresCluster(ReplicaOf origin) {
    makeFolders();
    mustSucceed(asOwner("pg_basebackup", {"--pgdata", path(), "--username", "postgres", "--host",
                                          origin.primary.socketDirectory(), "--write-recovery-conf",
                                          "--no-sync", "--checkpoint", "fast"}),
                "pg_basebackup");
    start();
}

PostgresCluster::~PostgresCluster() {
    if (server_ != nullptr) stopImmediately();
}

void PostgresCluster::makeFolders() {
    // The owner of the cluster needs access to it.
    require(::chmod(directory_.path().c_str(), 0755) == 0, "chmod");
    for (const std::string& folder : {path(), socketDirectory()}) {
        require(::mkdir(folder.c_str(), 0700) == 0, "mkdir");
        if (::getuid() == 0) require(::chown(folder.c_str(), kNobody, kNobody) == 0, "chown");
    }
}

Command PostgresCluster::asOwner(const std::string& program, std::vector<std::string> arguments) const {
    Command command{.executable = "/usr/bin/setpriv",
                    .environment = {{"PATH", "/usr/sbin:/usr/bin:/sbin:/bin"}, {"LC_ALL", "C"}},
                    .workingDirectory = directory_.path()};
    // A server never outlives its test, however the test ends.
    std::vector<std::string> before{"--pdeathsig", "QUIT"};
    if (::getuid() == 0) {
        const std::string user = std::to_string(kNobody);
        before.insert(before.end(), {"--reuid", user, "--regid", user, "--clear-groups"});
    }
    before.insert(before.end(), {"--", programs() + "/" + program});
    arguments.insert(arguments.begin(), before.begin(), before.end());
    command.arguments = std::move(arguments);
    return command;
}

void PostgresCluster::start() {
    std::filesystem::remove(path() + "/postmaster.pid");
    // The tests end processes, not the machine: written data stay, flushed or not.
    server_ = std::make_unique<pinwell::test::RunningProcess>(asOwner(
        "postgres", {"-D", path(), "-k", socketDirectory(), "-c", "listen_addresses=", "-c", "fsync=off",
                     "-c", "shared_buffers=16MB", "-c", "max_connections=60", "-c", "autovacuum=off"}));
    const Command ready = asOwner("pg_isready", {"--quiet", "--host", socketDirectory()});
    const auto end = std::chrono::steady_clock::now() + kStartPatience;
    while (runProcess(ready).exitStatus != 0) {
        if (!server_->isRunning() || std::chrono::steady_clock::now() > end) {
            throw std::runtime_error("PostgreSQL does not start: " + server_->resultSoFar().errors);
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
}

void PostgresCluster::stopImmediately() {
    server_->sendSignal(SIGQUIT);
    server_->wait();
    server_.reset();
}

PostgresPlace PostgresCluster::makeDatabaseOfCaller() {
    std::string url = makeDatabase();
    sql(url, "CREATE ROLE \"" + nameOfCaller() + "\" SUPERUSER LOGIN");
    url.erase(url.find("&user="));
    return {.url = std::move(url), .named = "test"};
}

std::string PostgresCluster::url(const std::string& database) const {
    return "postgresql:///" + database + "?host=" + socketDirectory() + "&user=postgres";
}

std::string PostgresCluster::sql(const std::string& url, const std::string& statements) const {
    const ProcessResult result =
        runProcess(asOwner("psql", {"--no-psqlrc", "--quiet", "--tuples-only", "--no-align", "--set",
                                    "ON_ERROR_STOP=1", "--command", statements, url}));
    if (result.exitStatus != 0) throw std::runtime_error("psql: " + result.errors);
    return result.output;
}

std::string PostgresCluster::makeDatabase(const std::string& options) {
    const std::string name = "lumora" + std::to_string(++databases_);
    sql(url("postgres"), "CREATE DATABASE " + name + " " + options);
    return url(name);
}

}  // namespace pinwell::lumora::test
