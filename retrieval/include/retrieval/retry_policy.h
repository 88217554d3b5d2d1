// When a request is repeated, and after which delay.
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>

#include "https/session.h"

namespace pinwell::retrieval {

using Clock = std::chrono::steady_clock;

/// The longest delay of our own choice; the second constant is the longest delay that a server may ask for.
inline constexpr std::chrono::seconds kLongestDelay{60};
inline constexpr std::chrono::seconds kLongestRetryAfter{600};

/// Between two polls for a ticket that is not issued yet.
inline constexpr std::chrono::seconds kLongestPollDelay{30};
inline constexpr std::chrono::milliseconds kShortestPollDelay{100};

struct RetryPolicy {
    /// The number of tries after the first.
    unsigned retries = 5;

    /// The delay before the first retry; doubled before each further one.
    std::chrono::duration<double> firstDelay{1.0};

    /// The delay before the next try. `failures` counts the tries so far, from 1. `chance`, from 0 to 1, adds
    /// that part of half the delay, so that many clients do not return at the same time. A server's
    /// Retry-After replaces our choice.
    Clock::duration delayAfter(unsigned failures, std::optional<std::chrono::seconds> retryAfter,
                               double chance) const;

    /// The delay before the next poll for a ticket that is not issued yet, after that many polls, from 1. At
    /// least a tenth of a second.
    Clock::duration pollDelayAfter(unsigned polls, double chance) const;
};

/// From 0 to 1, from any thread.
double randomChance();

/// Whether a response of this status asks for a later retry. These are the statuses of a gateway or an
/// overloaded service (429, 502, 503, 504). They say nothing about the request.
bool isBusyStatus(int status);

/// The delay that the response asks for (RFC 9110, section 10.2.3); `nullopt` if it names none.
std::optional<std::chrono::seconds> retryAfterOf(const https::HTTPResponse& response);

}  // namespace pinwell::retrieval
