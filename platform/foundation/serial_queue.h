// A serial queue: blocks of work run one after another on the queue's own thread.
#pragma once

#include <condition_variable>
#include <deque>
#include <functional>
#include <mutex>
#include <string>
#include <thread>

namespace pinwell::foundation {

/// Work runs in the order of the calls, one piece at a time.
/// The destructor runs the queued work, then joins; never destroy it on the queue's own thread. An exception
/// that leaves a piece of work ends the process.
class SerialQueue {
  public:
    /// Throws std::system_error if no thread can be started.
    explicit SerialQueue(std::string name);
    ~SerialQueue();
    SerialQueue(const SerialQueue&) = delete;
    SerialQueue& operator=(const SerialQueue&) = delete;

    /// Queues `work` and returns. May be called from any thread, even the queue's own.
    void async(std::function<void()> work);

    /// Queues `work` and waits until it has run. On the queue's own thread it runs at once.
    void sync(const std::function<void()>& work);

    bool isCurrent() const noexcept { return std::this_thread::get_id() == thread_.get_id(); }

  private:
    void run();

    std::mutex mutex_;
    std::condition_variable changed_;
    std::deque<std::function<void()>> work_;
    bool stopping_ = false;
    std::thread thread_;  // last: it uses all of the above
};

}  // namespace pinwell::foundation
