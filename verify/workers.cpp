#include "verify/workers.h"

#include <sched.h>

#include <algorithm>
#include <exception>
#include <system_error>

namespace pinwell::verify {

namespace {

unsigned usableProcessors() {
    cpu_set_t set;
    CPU_ZERO(&set);
    if (sched_getaffinity(0, sizeof set, &set) == 0)
        return static_cast<unsigned>(std::max(1, CPU_COUNT(&set)));
    return std::max(1U, std::thread::hardware_concurrency());
}

}  // namespace

struct Workers::Batch {
    std::mutex mutex;
    std::condition_variable finished;
    const std::function<void(std::size_t)>* part = nullptr;
    std::size_t count = 0;
    std::size_t next = 0;
    std::size_t running = 0;
    std::exception_ptr failure;
};

Workers::Workers(unsigned threads) {
    if (threads == 0) threads = usableProcessors();
    try {
        for (unsigned i = 1; i < threads; ++i) pool_.emplace_back([this] { run(); });
    } catch (const std::system_error&) {
        // With fewer threads it is only slower.
    }
}

Workers::~Workers() {
    {
        const std::lock_guard lock(mutex_);
        stopping_ = true;
    }
    wanted_.notify_all();
    for (std::thread& thread : pool_) thread.join();
}

void Workers::run() {
    for (;;) {
        std::shared_ptr<Batch> batch;
        {
            std::unique_lock lock(mutex_);
            wanted_.wait(lock, [this] { return stopping_ || !batches_.empty(); });
            if (batches_.empty()) return;
            batch = batches_.front();
        }
        workOn(*batch);
        // All of its parts have begun, so no other thread needs it.
        const std::lock_guard lock(mutex_);
        std::erase(batches_, batch);
    }
}

void Workers::workOn(Batch& batch) {
    std::unique_lock lock(batch.mutex);
    while (batch.next < batch.count && batch.failure == nullptr) {
        const std::size_t number = batch.next++;
        ++batch.running;
        lock.unlock();
        std::exception_ptr failure;
        try {
            (*batch.part)(number);
        } catch (...) {
            failure = std::current_exception();
        }
        lock.lock();
        --batch.running;
        if (failure != nullptr && batch.failure == nullptr) batch.failure = failure;
    }
    if (batch.running == 0) batch.finished.notify_all();
}

void Workers::forEach(std::size_t count, const std::function<void(std::size_t)>& part) {
    if (count <= 1 || pool_.empty()) {
        for (std::size_t i = 0; i < count; ++i) part(i);
        return;
    }
    const auto batch = std::make_shared<Batch>();
    batch->part = &part;
    batch->count = count;
    {
        const std::lock_guard lock(mutex_);
        batches_.push_back(batch);
    }
    wanted_.notify_all();
    workOn(*batch);
    {
        const std::lock_guard lock(mutex_);
        std::erase(batches_, batch);
    }
    std::unique_lock lock(batch->mutex);
    batch->finished.wait(lock, [&] { return batch->running == 0; });
    if (batch->failure != nullptr) std::rethrow_exception(batch->failure);
}

}  // namespace pinwell::verify
