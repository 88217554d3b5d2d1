// When to try again.
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>

namespace pinwell::retrieval {

using Clock = std::chrono::steady_clock;

/// No wait of our own choice is longer, and no wait that a server asks for is longer than the second one.
inline constexpr std::chrono::seconds kLongestDelay{60};
inline constexpr std::chrono::seconds kLongestRetryAfter{600};

/// Between two polls for what is not issued yet.
inline constexpr std::chrono::seconds kLongestPollDelay{30};
inline constexpr std::chrono::milliseconds kShortestPollDelay{100};

struct RetryPolicy {
    /// Tries after the first one.
    unsigned retries = 5;

    /// Before the first of them; doubled before each further one.
    std::chrono::duration<double> firstDelay{1.0};

    /// How long not to try. `failures` counts the tries so far, from 1. `chance` is from 0 to 1: the wait is
    /// longer by that part of its half, so that many clients do not come back together. A server's own wish
    /// (Retry-After) takes the place of our choice.
    Clock::duration delayAfter(unsigned failures, std::optional<std::chrono::seconds> retryAfter,
                               double chance) const;

    /// How long not to ask again for what is not issued yet, after so many answers that say so, from 1. Never
    /// less than a tenth of a second.
    Clock::duration pollDelayAfter(unsigned polls, double chance) const;
};

/// From 0 to 1, from any thread.
double randomChance();

}  // namespace pinwell::retrieval
