#include "retrieval/retry_policy.h"

#include <algorithm>
#include <cmath>
#include <random>

namespace pinwell::retrieval {
namespace {

constexpr double kLargestSpread = 0.5;
// If the server states the delay, a small addition is enough to spread clients.
constexpr double kSpreadOfAWish = 0.05;
constexpr unsigned kMaximumDoublings = 16;

}  // namespace

Clock::duration RetryPolicy::delayAfter(unsigned failures, std::optional<std::chrono::seconds> retryAfter,
                                        double chance) const {
    const auto spread = [chance](double seconds, double largest) {
        return std::chrono::duration_cast<Clock::duration>(
            std::chrono::duration<double>(seconds * (1.0 + largest * chance)));
    };
    if (retryAfter) {
        const auto wish = std::clamp(*retryAfter, std::chrono::seconds(0), kLongestRetryAfter);
        return spread(static_cast<double>(wish.count()), kSpreadOfAWish);
    }
    const unsigned doublings = std::min(std::max(failures, 1U) - 1, kMaximumDoublings);
    const double longest = static_cast<double>(kLongestDelay.count());
    return spread(std::min(std::ldexp(firstDelay.count(), static_cast<int>(doublings)), longest),
                  kLargestSpread);
}

Clock::duration RetryPolicy::pollDelayAfter(unsigned polls, double chance) const {
    return std::clamp<Clock::duration>(delayAfter(polls, std::nullopt, chance), kShortestPollDelay,
                                       kLongestPollDelay);
}

double randomChance() {
    thread_local std::mt19937 generator{std::random_device{}()};
    return std::uniform_real_distribution<double>(0.0, 1.0)(generator);
}

}  // namespace pinwell::retrieval
