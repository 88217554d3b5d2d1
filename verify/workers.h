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

/// A fixed number of threads. forEach may be called from any thread, from within a part of another forEach
/// too: the caller works on its own parts, so nothing waits for a thread that waits.
class Workers {
  public:
    /// `threads` in all, the caller's included; 0 stands for the number of processors that this process may
    /// use. Fewer run where no more threads can be had.
    explicit Workers(unsigned threads = 0);
    ~Workers();
    Workers(const Workers&) = delete;
    Workers& operator=(const Workers&) = delete;

    unsigned threads() const noexcept { return static_cast<unsigned>(pool_.size()) + 1; }

    /// Calls `part` once for each number below `count`, on several threads, and returns when all are done.
    /// What a part throws is thrown here, the first of them, when all that had begun are done; parts that had
    /// not begun are then left out.
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
