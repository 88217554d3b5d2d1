// Connections to one database, shared by threads: a bounded set of them, and their needs beside the network,
// by the URL and by the environment variables of libpq.
#pragma once

#include <condition_variable>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "postgres_connection.h"

namespace pinwell::lumora {

struct PostgresNeeds {
    bool tcp = false;                // some host is not a socket in the file system
    std::vector<std::string> files;  // passwords, certificates, keys; not all of them need to exist
};

/// Throws Failure (EX_CONFIG) if the URL cannot be parsed; `named` is its source.
PostgresNeeds postgresNeeds(const std::string& url, const std::string& named);

/// The user if the URL names none: $PGUSER, or the caller's login name. Empty if unknown.
std::string defaultPostgresUser();

/// For any thread.
class PostgresPool {
  public:
    /// A connection on loan. The destructor returns it, unless it has become unusable.
    class Lease {
      public:
        Lease(PostgresPool& pool, std::unique_ptr<PostgresConnection> connection)
            : pool_(&pool), connection_(std::move(connection)) {}
        Lease(Lease&&) = default;
        Lease& operator=(Lease&&) = delete;
        ~Lease();

        PostgresConnection& operator*() const { return *connection_; }
        PostgresConnection* operator->() const { return connection_.get(); }

        /// From discard() to keep(), the session is in the middle of something: without keep() the connection
        /// is closed at the end.
        void discard() noexcept { discarded_ = true; }
        void keep() noexcept { discarded_ = false; }

      private:
        PostgresPool* pool_;
        std::unique_ptr<PostgresConnection> connection_;
        bool discarded_ = false;
    };

    /// Opens no connection yet. Determines the caller's name now, because a process cannot do so after giving
    /// up its rights.
    PostgresPool(std::string url, std::size_t maximum);

    /// Waits for a free connection until the deadline, or opens one, which takes five seconds at most. After
    /// a timeout, it does not try that server again for the same time. Throws PostgresError.
    Lease take(Deadline deadline);

    /// Closes the idle connections: if one turns out to be broken, all may be.
    void closeIdle();

    /// The number of connections made so far.
    std::uint64_t opened() const;

  private:
    std::unique_ptr<PostgresConnection> open(Deadline deadline);
    void giveBack(std::unique_ptr<PostgresConnection> connection) noexcept;

    const std::string url_;
    const std::string user_;
    const std::size_t maximum_;
    mutable std::mutex mutex_;
    std::condition_variable freed_;
    std::vector<std::unique_ptr<PostgresConnection>> idle_;
    std::size_t inUse_ = 0;
    std::uint64_t opened_ = 0;
    Deadline notBefore_{};  // of the next attempt to connect
    std::string lastFailure_;
};

}  // namespace pinwell::lumora
