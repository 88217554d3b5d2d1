#include "postgres_pool.h"

#include <libpq-fe.h>
#include <algorithm>
#include <cstdlib>
#include <map>
#include <memory>

#include "failure.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using Clock = std::chrono::steady_clock;

struct Free {
    void operator()(PQconninfoOption* options) const { PQconninfoFree(options); }
    void operator()(char* text) const { PQfreemem(text); }
};
using Options = std::unique_ptr<PQconninfoOption, Free>;

void addTo(std::map<std::string, std::string>& values, const Options& options) {
    for (const PQconninfoOption* option = options.get(); option != nullptr && option->keyword != nullptr;
         ++option) {
        if (option->val != nullptr && option->val[0] != '\0') values.emplace(option->keyword, option->val);
    }
}

/// Whether a list with commas has a name or an address, not only directories of sockets.
bool namesAHost(const std::string& list) {
    for (std::size_t begin = 0; begin <= list.size();) {
        const std::size_t end = std::min(list.find(',', begin), list.size());
        if (end > begin && list[begin] != '/' && list[begin] != '@') return true;
        begin = end + 1;
    }
    return false;
}

}  // namespace

PostgresNeeds postgresNeeds(const std::string& url, const std::string& named) {
    char* error = nullptr;
    const Options given(PQconninfoParse(url.c_str(), &error));
    const std::unique_ptr<char, Free> text(error);
    if (given == nullptr) {
        // The library's text may repeat a part of the URL, with a password in it.
        throw Failure(EX_CONFIG, values::format("%@: the URL of the database cannot be read", named));
    }
    std::map<std::string, std::string> values;
    addTo(values, given);
    addTo(values, Options(PQconndefaults()));

    PostgresNeeds needs;
    needs.tcp = namesAHost(values["host"]) || namesAHost(values["hostaddr"]);
    if (values["sslrootcert"] == "system") {
        values.erase("sslrootcert");
        for (const char* path :
             {"/etc/ssl", "/usr/share/ca-certificates", "/usr/local/share/ca-certificates"}) {
            needs.files.emplace_back(path);
        }
    }
    for (const char* key : {"passfile", "sslcert", "sslkey", "sslrootcert", "sslcrl", "sslcrldir"}) {
        if (!values[key].empty()) needs.files.push_back(values[key]);
    }
    if (const char* home = std::getenv("HOME"); home != nullptr && *home != '\0') {
        needs.files.push_back(std::string(home) + "/.pgpass");
        needs.files.push_back(std::string(home) + "/.postgresql");
    }
    return needs;
}

std::string defaultPostgresUser() {
    std::map<std::string, std::string> values;
    addTo(values, Options(PQconndefaults()));
    return values["user"];
}

namespace {

constexpr std::chrono::seconds kConnectTime{5};

}  // namespace

PostgresPool::PostgresPool(std::string url, std::size_t maximum)
    : url_(std::move(url)), user_(defaultPostgresUser()), maximum_(maximum) {}

PostgresPool::Lease::~Lease() {
    if (connection_ == nullptr) return;
    if (discarded_ || !connection_->usable()) connection_.reset();
    pool_->giveBack(std::move(connection_));
}

PostgresPool::Lease PostgresPool::take(Deadline deadline) {
    std::unique_ptr<PostgresConnection> connection;
    {
        std::unique_lock lock(mutex_);
        const auto available = [this] { return !idle_.empty() || inUse_ < maximum_; };
        if (!freed_.wait_until(lock, deadline, available)) {
            throw PostgresError("", true, "all connections to the database are in use");
        }
        if (idle_.empty() && Clock::now() < notBefore_) throw PostgresError("", true, lastFailure_);
        ++inUse_;
        if (!idle_.empty()) {
            connection = std::move(idle_.back());
            idle_.pop_back();
        }
    }
    if (connection == nullptr) connection = open(deadline);
    return {*this, std::move(connection)};
}

std::unique_ptr<PostgresConnection> PostgresPool::open(Deadline deadline) {
    const Deadline begin = Clock::now();
    try {
        auto connection =
            std::make_unique<PostgresConnection>(url_, std::min(deadline, begin + kConnectTime), user_);
        const std::lock_guard lock(mutex_);
        ++opened_;
        return connection;
    } catch (const PostgresError& error) {
        {
            const std::lock_guard lock(mutex_);
            notBefore_ = Clock::now() + (Clock::now() - begin);
            lastFailure_ = error.what();
        }
        giveBack(nullptr);
        throw;
    } catch (...) {
        giveBack(nullptr);
        throw;
    }
}

void PostgresPool::giveBack(std::unique_ptr<PostgresConnection> connection) noexcept {
    {
        const std::lock_guard lock(mutex_);
        --inUse_;
        if (connection != nullptr) idle_.push_back(std::move(connection));
    }
    freed_.notify_one();
}

std::uint64_t PostgresPool::opened() const {
    const std::lock_guard lock(mutex_);
    return opened_;
}

void PostgresPool::closeIdle() {
    std::vector<std::unique_ptr<PostgresConnection>> closing;
    const std::lock_guard lock(mutex_);
    closing.swap(idle_);
}

}  // namespace pinwell::lumora
