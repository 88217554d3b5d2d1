// Threads that take tasks from one queue, and the signal to the thread that waits for their results in
// poll(2).
#pragma once

#include <condition_variable>
#include <cstddef>
#include <deque>
#include <functional>
#include <mutex>
#include <thread>
#include <vector>

#include "base/handle.h"

namespace pinwell::batch {

/// Starts threads on demand, up to the maximum. The destructor waits for the running tasks and drops the
/// others.
class Workers {
  public:
    explicit Workers(std::size_t maximum) : maximum_(maximum) {}
    ~Workers();
    Workers(const Workers&) = delete;
    Workers& operator=(const Workers&) = delete;

    /// Queues a task; urgent tasks go before all others. An exception that leaves a task ends the process.
    /// Throws std::system_error if no thread at all can be started.
    void add(std::function<void()> task, bool isUrgent = false);

  private:
    void work();

    const std::size_t maximum_;
    std::mutex mutex_;
    std::condition_variable changed_;
    std::deque<std::function<void()>> urgent_;
    std::deque<std::function<void()>> tasks_;
    std::size_t idle_ = 0;
    bool stopping_ = false;
    std::vector<std::thread> threads_;
};

/// Wakes a thread that waits in poll(2).
class WakeUp {
  public:
    /// Throws std::system_error.
    WakeUp();

    /// From any thread.
    void raise() noexcept;

    /// Resets it.
    void clear() noexcept;

    /// Readable from raise() to clear().
    int descriptor() const noexcept { return event_.get(); }

  private:
    base::FileDescriptor event_;
};

}  // namespace pinwell::batch
