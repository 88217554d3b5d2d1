// A PostgreSQL cluster of a test's own: real programs, a socket in the test's folder, no TCP.
#pragma once

#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>

#include "lumora-local/postgres_store.h"
#include "support/process.h"
#include "support/temporary_directory.h"

namespace pinwell::lumora::test {

class PostgresCluster {
  public:
    /// Why there can be no cluster here; `nullopt` if there can be one.
    static std::optional<std::string> missing();

    /// The cluster that the tests of a program share, started at its first use.
    static PostgresCluster& shared();

    /// Makes a cluster with the newest installed release, and starts it. The superuser makes it as the user
    /// `nobody`, because PostgreSQL refuses to run as the superuser. Throws std::runtime_error.
    PostgresCluster();

    struct ReplicaOf {
        const PostgresCluster& primary;
    };
    /// A cluster that follows another one, and cannot be written.
    explicit PostgresCluster(ReplicaOf origin);

    ~PostgresCluster();
    PostgresCluster(const PostgresCluster&) = delete;
    PostgresCluster& operator=(const PostgresCluster&) = delete;

    /// Makes an empty database. Returns its URL, with a superuser.
    std::string makeDatabase(const std::string& options = "");

    /// Makes an empty database for this program's user. Its URL has no user, so that programs must know
    /// theirs even after giving up their rights. Once for a cluster.
    PostgresPlace makeDatabaseOfCaller();

    /// The URL of a database by its name.
    std::string url(const std::string& database) const;

    /// Runs SQL in a database, as the cluster's superuser; returns the fields, a row a line.
    std::string sql(const std::string& url, const std::string& statements) const;

    /// Starts the server again, and waits until it responds.
    void start();

    /// Ends it at once, like a power failure for the database: no transaction is finished.
    void stopImmediately();

    std::string socketDirectory() const { return directory_ / "socket"; }
    std::string path() const { return directory_ / "data"; }

  private:
    pinwell::test::Command asOwner(const std::string& program, std::vector<std::string> arguments) const;
    void makeFolders();

    pinwell::test::TemporaryDirectory directory_;
    std::unique_ptr<pinwell::test::RunningProcess> server_;
    int databases_ = 0;
};

/// Tests with a cluster that they may kill, and an empty database of the caller in it.
class OwnClusterTest : public testing::Test {
  protected:
    void SetUp() override {
        if (const auto reason = PostgresCluster::missing()) GTEST_SKIP() << *reason;
        cluster_ = std::make_unique<PostgresCluster>();
        place_ = cluster_->makeDatabaseOfCaller();
    }

    std::unique_ptr<PostgresCluster> cluster_;
    PostgresPlace place_;
};

}  // namespace pinwell::lumora::test
