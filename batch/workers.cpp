#include "workers.h"

#include <sys/eventfd.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <system_error>
#include <utility>

namespace pinwell::batch {

Workers::~Workers() {
    {
        const std::lock_guard lock(mutex_);
        stopping_ = true;
        urgent_.clear();
        tasks_.clear();
    }
    changed_.notify_all();
    for (std::thread& thread : threads_) thread.join();
}

void Workers::add(std::function<void()> task, bool isUrgent) {
    const std::lock_guard lock(mutex_);
    (isUrgent ? urgent_ : tasks_).push_back(std::move(task));
    if (idle_ < urgent_.size() + tasks_.size() && threads_.size() < maximum_) {
        try {
            threads_.emplace_back([this] { work(); });
        } catch (const std::system_error&) {
            if (threads_.empty()) throw;  // with fewer threads it only takes longer
        }
    }
    changed_.notify_one();
}

void Workers::work() {
    std::unique_lock lock(mutex_);
    while (true) {
        ++idle_;
        changed_.wait(lock, [this] { return stopping_ || !urgent_.empty() || !tasks_.empty(); });
        --idle_;
        if (stopping_) return;
        auto& queue = urgent_.empty() ? tasks_ : urgent_;
        std::function<void()> task = std::move(queue.front());
        queue.pop_front();
        lock.unlock();
        task();
        task = nullptr;  // frees its objects before the thread waits
        lock.lock();
    }
}

WakeUp::WakeUp() : event_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
    if (!event_) throw std::system_error(errno, std::generic_category(), "eventfd");
}

void WakeUp::raise() noexcept {
    const std::uint64_t one = 1;
    // Fails only if the counter is full; then the descriptor is already readable.
    [[maybe_unused]] const ssize_t ignored = ::write(event_.get(), &one, sizeof one);
}

void WakeUp::clear() noexcept {
    std::uint64_t count = 0;
    [[maybe_unused]] const ssize_t ignored = ::read(event_.get(), &count, sizeof count);
}

}  // namespace pinwell::batch
