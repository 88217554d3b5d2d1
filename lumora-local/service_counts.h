// The counts of a running service, for its metrics.
//
// The number of counters is fixed: no input of a client makes a new one. Counting costs a few atomic
// additions, and no lock.
#pragma once

#include <array>
#include <atomic>
#include <chrono>
#include <cstdint>

namespace pinwell::lumora {

/// The kind of a request, by its target.
enum class RequestKind { lookup, asset, health, readiness, administration, other, unreadable };

inline constexpr std::array kRequestKindNames{"lookup",         "asset", "healthz",   "readyz",
                                              "administration", "other", "unreadable"};
inline constexpr std::size_t kRequestKinds = kRequestKindNames.size();

/// Statuses with their own count; all others are counted together.
inline constexpr std::array kCountedStatuses{200, 201, 400, 401, 403, 404, 405, 408, 409,
                                             411, 413, 414, 415, 422, 429, 431, 500, 503};
inline constexpr std::size_t kOtherStatus = kCountedStatuses.size();

/// Upper bounds of a response's time, in microseconds. Slower responses are counted beyond the last.
inline constexpr std::array<std::uint64_t, 15> kDurationBounds{
    100,    250,     500,     1'000,   2'500,     5'000,     10'000,    25'000,
    50'000, 100'000, 250'000, 500'000, 1'000'000, 2'500'000, 10'000'000};

/// For any thread.
class ServiceCounts {
  public:
    template <class Number>
    struct Requests {
        std::array<Number, kCountedStatuses.size() + 1> byStatus{};
        std::array<Number, kDurationBounds.size() + 1> byDuration{};  // each request in one place
        Number microseconds{};
    };

    /// All numbers at about one time.
    template <class Number>
    struct Numbers {
        std::array<Requests<Number>, kRequestKinds> requests{};
        Number recordsKnown{};       // records in responses
        Number recordsUnknown{};     // names in responses without a record
        Number recordsFromMemory{};  // of the known ones, those read without the store
        Number connectionsAccepted{};
        Number connectionsClosed{};
        Number connectionsRefused{};  // of peers with too many
        Number handshakesFailed{};
        Number storeFailures{};  // requests that failed because of the store
    };
    using Snapshot = Numbers<std::uint64_t>;

    void requestAnswered(RequestKind kind, int status, std::chrono::microseconds duration) noexcept;
    void recordsAnswered(std::size_t known, std::size_t unknown, std::size_t fromMemory) noexcept;
    void connectionAccepted() noexcept { add(numbers_.connectionsAccepted); }
    void connectionClosed() noexcept { add(numbers_.connectionsClosed); }
    void connectionRefused() noexcept { add(numbers_.connectionsRefused); }
    void handshakeFailed() noexcept { add(numbers_.handshakesFailed); }
    void storeFailed() noexcept { add(numbers_.storeFailures); }

    Snapshot read() const noexcept;

  private:
    using Counter = std::atomic<std::uint64_t>;

    static void add(Counter& counter, std::uint64_t number = 1) noexcept {
        counter.fetch_add(number, std::memory_order_relaxed);
    }

    Numbers<Counter> numbers_;
};

}  // namespace pinwell::lumora
