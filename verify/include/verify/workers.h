// Threads that share the independent parts of a piece of work.
#pragma once

#include <condition_variable>
#include <cstddef>
#include <deque>
#include <functional>
#include <memory>
#include <mutex>
#include <thread>
#include <vector>

namespace pinwell::verify {

/// A fixed number of threads. forEach may be called from any thread, even from a part of another forEach. The
/// caller works on its own parts, so a waiting thread never waits for another waiting thread.
class Workers {
  public:
    /// `threads` in all, with the caller's; 0 means the number of processors that this process may use. Fewer
    /// run if no more threads can be started.
    explicit Workers(unsigned threads = 0);
    ~Workers();
    Workers(const Workers&) = delete;
    Workers& operator=(const Workers&) = delete;

    unsigned threads() const noexcept { return static_cast<unsigned>(pool_.size()) + 1; }

    /// Calls `part` once for each number below `count`, on several threads, and returns when all are done.
    /// Rethrows the first exception of a part, after all running parts are done; parts that have not begun
    /// are then skipped.
    void forEach(std::size_t count, const std::function<void(std::size_t)>& part);

  private:
    struct Batch;

    void run();
    void workOn(Batch& batch);

    std::mutex mutex_;
    std::condition_variable wanted_;
    std::deque<std::shared_ptr<Batch>> batches_;
    bool stopping_ = false;
    std::vector<std::thread> pool_;  // last: it uses all of the above
};

}  // namespace pinwell::verify
