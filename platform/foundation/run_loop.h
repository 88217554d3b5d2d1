// A loop in which a thread waits while other threads work.
#pragma once

#include <condition_variable>
#include <mutex>

namespace pinwell::foundation {

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

}  // namespace pinwell::foundation
