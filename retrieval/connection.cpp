#include "retrieval/connection.h"

#include <condition_variable>
#include <future>
#include <set>
#include <utility>

#include "src/DownloadDelegate.h"
#include "src/messages.h"

namespace pinwell::retrieval {
namespace {

base::Error cancelledError() {
    return {base::kURLErrorDomain, static_cast<std::int64_t>(https::URLErrorCode::cancelled),
            "The lookup was ended before its answer came."};
}

}  // namespace

Exchange Connection::exchange(https::Request request, std::optional<Clock::time_point> deadline) {
    std::promise<Exchange> ended;
    std::future<Exchange> outcome = ended.get_future();
    std::shared_ptr<https::Task> task;
    {
        const std::lock_guard lock(mutex_);
        if (cancelled_) return {.error = cancelledError()};
        if (!session_) {
            auto session = platform_.https.ephemeralSession(*this);
            if (!session) return {.error = session.error()};
            session_ = *std::move(session);
        }
        serverWasRefused_ = false;
        messages_.clear();
        task = session_->dataTask(
            std::move(request), [&ended](const auto& data, const auto& response, const auto& error) {
                ended.set_value({.response = response, .body = data.value_or(base::Data{}), .error = error});
            });
        task->resume();
    }
    if (deadline && outcome.wait_until(*deadline) == std::future_status::timeout) cancel();
    Exchange result = outcome.get();
    result.serverWasRefused = serverWasRefused_;
    result.messages = std::exchange(messages_, {});
    return result;
}

void Connection::cancel() {
    std::shared_ptr<https::Session> session;
    {
        const std::lock_guard lock(mutex_);
        cancelled_ = true;
        session = std::move(session_);
    }
    session.reset();  // waits for the callbacks of a running task
}

bool Connection::isCancelled() const {
    const std::lock_guard lock(mutex_);
    return cancelled_;
}

void Connection::didReceiveChallenge(https::Session&, const https::AuthenticationChallenge& challenge,
                                     const https::ChallengeCompletion& completion) {
    const MessageRedirection redirection([this](std::string line) { messages_.push_back(std::move(line)); });
    answerServerChallenge(
        challenge, [&](https::Disposition disposition, const std::optional<https::Credential>& credential) {
            serverWasRefused_ = disposition != https::Disposition::useCredential;
            completion(disposition, credential);
        });
}

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
