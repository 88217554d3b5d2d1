// Where a thread waits while other threads do the work.
#pragma once

#include <condition_variable>
#include <mutex>

namespace pinwell::foundation {

class RunLoop {
  public:
    /// Parks the calling thread until stop(). A process that is ended from elsewhere never returns from here.
    void run() {
        std::unique_lock lock(mutex_);
        changed_.wait(lock, [this] { return stopped_; });
    }

    /// Lets run() return, now or when it is called. From any thread.
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
