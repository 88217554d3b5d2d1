// The counts of a running service, for its metrics.
//
// The number of counters is fixed: no input of a client makes a new one. Counting costs a few atomic
// additions, and no lock.
#pragma once

#include <algorithm>
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
        Number connectionsRefused{};  // of peers that have too many
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

inline void ServiceCounts::requestAnswered(RequestKind kind, int status,
                                           std::chrono::microseconds duration) noexcept {
    Requests<Counter>& requests = numbers_.requests.at(static_cast<std::size_t>(kind));
    const auto* const known = std::find(kCountedStatuses.begin(), kCountedStatuses.end(), status);
    add(requests.byStatus.at(static_cast<std::size_t>(known - kCountedStatuses.begin())));
    const auto microseconds =
        static_cast<std::uint64_t>(std::max<std::chrono::microseconds::rep>(duration.count(), 0));
    const auto* const bound = std::lower_bound(kDurationBounds.begin(), kDurationBounds.end(), microseconds);
    add(requests.byDuration.at(static_cast<std::size_t>(bound - kDurationBounds.begin())));
    add(requests.microseconds, microseconds);
}

inline void ServiceCounts::recordsAnswered(std::size_t known, std::size_t unknown,
                                           std::size_t fromMemory) noexcept {
    if (known > 0) add(numbers_.recordsKnown, known);
    if (unknown > 0) add(numbers_.recordsUnknown, unknown);
    if (fromMemory > 0) add(numbers_.recordsFromMemory, fromMemory);
}

inline ServiceCounts::Snapshot ServiceCounts::read() const noexcept {
    Snapshot snapshot;
    const auto copy = [](const auto& from, auto& to) {
        for (std::size_t i = 0; i < from.size(); ++i) to[i] = from[i].load(std::memory_order_relaxed);
    };
    for (std::size_t kind = 0; kind < kRequestKinds; ++kind) {
        copy(numbers_.requests[kind].byStatus, snapshot.requests[kind].byStatus);
        copy(numbers_.requests[kind].byDuration, snapshot.requests[kind].byDuration);
        snapshot.requests[kind].microseconds = numbers_.requests[kind].microseconds;
    }
    snapshot.recordsKnown = numbers_.recordsKnown;
    snapshot.recordsUnknown = numbers_.recordsUnknown;
    snapshot.recordsFromMemory = numbers_.recordsFromMemory;
    // Closed before accepted: there are never more closed ones.
    snapshot.connectionsClosed = numbers_.connectionsClosed;
    snapshot.connectionsAccepted = numbers_.connectionsAccepted;
    snapshot.connectionsRefused = numbers_.connectionsRefused;
    snapshot.handshakesFailed = numbers_.handshakesFailed;
    snapshot.storeFailures = numbers_.storeFailures;
    return snapshot;
}

}  // namespace pinwell::lumora
