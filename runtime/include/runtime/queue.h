// Threads that work and threads that wait: a serial queue, and the run loop.
#pragma once

#include <condition_variable>
#include <deque>
#include <functional>
#include <mutex>
#include <string>
#include <thread>

namespace pinwell::runtime {

/// A serial queue: blocks of work run on the queue's own thread, in the order of the calls, one at a time.
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

/// A loop in which a thread waits while other threads work.
class RunLoop {
  public:
    /// Blocks the calling thread until stop(). Never returns if another thread ends the process.
    void run() {
        std::unique_lock lock(mutex_);
        changed_.wait(lock, [this] { return stopped_; });
    }

    /// Makes run() return, at once or when it is called. From any thread.
    void stop() {
        const std::lock_guard lock(mutex_);
        stopped_ = true;
        changed_.notify_all();
    }

  private:
    std::mutex mutex_;
    std::condition_variable changed_;
    bool stopped_ = false;
};

}  // namespace pinwell::runtime
