#include "lumora-local/service_counts.h"

#include <algorithm>

namespace pinwell::lumora {

void ServiceCounts::requestAnswered(RequestKind kind, int status,
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

void ServiceCounts::recordsAnswered(std::size_t known, std::size_t unknown, std::size_t fromMemory) noexcept {
    if (known > 0) add(numbers_.recordsKnown, known);
    if (unknown > 0) add(numbers_.recordsUnknown, unknown);
    if (fromMemory > 0) add(numbers_.recordsFromMemory, fromMemory);
}

ServiceCounts::Snapshot ServiceCounts::read() const noexcept {
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
