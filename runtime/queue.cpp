#include "runtime/queue.h"

#include <pthread.h>

#include <algorithm>
#include <utility>

#include "runtime/signals.h"

namespace pinwell::runtime {

SerialQueue::SerialQueue(std::string name) : thread_([this] { run(); }) {
    name.resize(std::min<std::size_t>(name.size(), 15));  // the kernel's limit
    pthread_setname_np(thread_.native_handle(), name.c_str());
}

SerialQueue::~SerialQueue() {
    {
        const std::lock_guard lock(mutex_);
        stopping_ = true;
    }
    changed_.notify_one();
    thread_.join();
}

void SerialQueue::async(std::function<void()> work) {
    {
        const std::lock_guard lock(mutex_);
        work_.push_back(std::move(work));
    }
    changed_.notify_one();
}

void SerialQueue::sync(const std::function<void()>& work) {
    if (isCurrent()) {
        [&]() noexcept { work(); }();
        return;
    }
    std::mutex mutex;
    std::condition_variable finished;
    bool done = false;
    async([&] {
        work();
        const std::lock_guard lock(mutex);
        done = true;
        finished.notify_one();
    });
    std::unique_lock lock(mutex);
    finished.wait(lock, [&] { return done; });
}

void SerialQueue::run() {
    const StackGuard guard;
    std::unique_lock lock(mutex_);
    while (true) {
        changed_.wait(lock, [this] { return stopping_ || !work_.empty(); });
        if (work_.empty()) return;
        auto work = std::exchange(work_.front(), nullptr);
        work_.pop_front();
        lock.unlock();
        work();
        work = nullptr;  // freed while the queue is unlocked: destructors may still queue work
        lock.lock();
    }
}

}  // namespace pinwell::runtime
