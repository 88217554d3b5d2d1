// Instances of the real service on one database, and counts of their clients' responses.
#pragma once

#include <atomic>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "lumora-local/record_store.h"
#include "support/process.h"
#include "support/temporary_directory.h"

namespace httplib {
class SSLClient;
}

namespace pinwell::lumora::test {

/// A service directory for 127.0.0.1, made by the program.
std::string makeService(const pinwell::test::TemporaryDirectory& directory, const std::string& name);

/// lumora-local, run to its end.
pinwell::test::ProcessResult runLumora(std::vector<std::string> arguments);

/// `serve` on a free loopback port until the test ends.
class ServingInstance {
  public:
    /// Throws std::runtime_error if it does not start.
    explicit ServingInstance(const std::string& service);

    int port() const noexcept { return port_; }
    void kill();

  private:
    pinwell::test::RunningProcess process_;
    int port_ = 0;
};

/// A loopback port without a listener.
int freePort();

/// Trusts only the root of the service in `service`.
std::unique_ptr<httplib::SSLClient> clientOf(const std::string& service, int port);

/// The status of the response to GET /healthz.
int healthOf(const std::string& service, int port);

/// Writers that change records, and clients that look them up, at the same time. A record's ticket has the
/// number of its put, so a client can distinguish an older state from a newer one.
class Load {
  public:
    struct Counts {
        std::size_t acknowledged = 0;
        std::size_t refusedChanges = 0;  // by a failure that allows a retry
        std::size_t wrongFailures = 0;   // of changes, by any other failure
        std::size_t answered = 0;
        std::size_t retriable = 0;     // lookups: no connection, or 503 with Retry-After
        std::size_t wrongAnswers = 0;  // lookups: any other refusal
        std::size_t older = 0;         // lookups: a state older than one acknowledged before
        std::size_t exhausted = 0;     // lookups that failed again and again for a minute
    };

    /// One writer for each store, with its own records. Clients send requests to `port`.
    Load(std::vector<RecordStore*> stores, std::string service, int port, int clients);
    ~Load();
    Load(const Load&) = delete;
    Load& operator=(const Load&) = delete;

    /// Waits for this number of further acknowledged changes, and of further successful lookups. False if
    /// that takes two minutes.
    bool goOn(std::size_t changes, std::size_t lookups);

    /// Ends writers and clients.
    void stop();

    Counts counts() const;

    /// Acknowledged changes that are missing in the store or its log; one line each.
    std::vector<std::string> lost(RecordStore& store) const;

  private:
    struct Subject {
        std::string name;
        std::atomic<int> acknowledged{0};
        std::vector<int> all;  // only its writer uses it, until stop()
    };

    void write(std::size_t writer);
    void ask(unsigned seed);
    bool askOnce(httplib::SSLClient& client, const Subject& subject);

    const std::vector<RecordStore*> stores_;
    const std::string service_;
    const int port_;
    std::vector<std::unique_ptr<Subject>> subjects_;
    std::vector<std::thread> threads_;
    std::atomic<bool> stopping_{false};
    std::atomic<std::size_t> acknowledged_{0}, refusedChanges_{0}, wrongFailures_{0}, answered_{0},
        retriable_{0}, wrongAnswers_{0}, older_{0}, exhausted_{0};
};

}  // namespace pinwell::lumora::test
