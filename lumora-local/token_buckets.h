// The rates of many clients: a bucket of tokens for each name.
//
// A bucket holds `burst` tokens and gets one back every `interval`. The table is bounded: beyond its bound,
// the least recently used bucket is removed, as if it were full.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <list>
#include <mutex>
#include <optional>
#include <string>
#include <unordered_map>

namespace pinwell::lumora {

/// For any thread.
class TokenBuckets {
  public:
    using Clock = std::chrono::steady_clock;
    using Now = std::function<Clock::time_point()>;

    struct Allowance {
        std::int64_t burst = 1;
        std::chrono::milliseconds interval{1000};  // between two tokens
    };

    explicit TokenBuckets(Allowance allowance, std::size_t clients = 1024, Now now = Clock::now)
        : allowance_(allowance), clients_(clients), now_(std::move(now)) {}

    /// Takes a token. `nullopt` if there was one; otherwise the number of whole seconds until the next, at
    /// least one.
    std::optional<std::int64_t> take(const std::string& name);

    std::size_t size() const;

  private:
    struct Bucket {
        std::string name;
        Clock::time_point fullAt;  // when all of its tokens are back
    };
    using Buckets = std::list<Bucket>;

    const Allowance allowance_;
    const std::size_t clients_;
    const Now now_;
    mutable std::mutex mutex_;
    Buckets buckets_;  // the most recently used one is first
    std::unordered_map<std::string, Buckets::iterator> places_;
};

}  // namespace pinwell::lumora
