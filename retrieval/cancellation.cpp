#include "retrieval/cancellation.h"

#include <condition_variable>
#include <mutex>
#include <set>

#include "retrieval/connection.h"

namespace pinwell::retrieval {

struct Cancellation::State {
    std::mutex mutex;
    std::condition_variable changed;
    bool cancelled = false;
    std::set<Connection*> connections;  // in use by calls
};

Cancellation::Cancellation() : state_(std::make_shared<State>()) {}
Cancellation::~Cancellation() = default;

void Cancellation::cancel() {
    const std::lock_guard lock(state_->mutex);
    state_->cancelled = true;
    state_->changed.notify_all();
    for (Connection* const connection : state_->connections) connection->cancel();
}

bool Cancellation::isCancelled() const {
    const std::lock_guard lock(state_->mutex);
    return state_->cancelled;
}

bool Cancellation::sleepUntil(Clock::time_point end) const {
    std::unique_lock lock(state_->mutex);
    return state_->changed.wait_until(lock, end, [this] { return state_->cancelled; });
}

Cancellation::Use::Use(const Cancellation& cancellation, Connection& connection)
    : state_(cancellation.state_), connection_(connection) {
    const std::lock_guard lock(state_->mutex);
    state_->connections.insert(&connection_);
    if (state_->cancelled) connection_.cancel();
}

Cancellation::Use::~Use() {
    const std::lock_guard lock(state_->mutex);
    state_->connections.erase(&connection_);
}

}  // namespace pinwell::retrieval
