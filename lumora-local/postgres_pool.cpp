#include "lumora-local/postgres_pool.h"

#include <algorithm>

#include "lumora-local/postgres_needs.h"

namespace pinwell::lumora {
namespace {

using Clock = std::chrono::steady_clock;

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
