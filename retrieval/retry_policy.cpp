#include "retrieval/retry_policy.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <ctime>
#include <random>
#include <string>

namespace pinwell::retrieval {
namespace {

constexpr double kLargestSpread = 0.5;
// If the server states the delay, a small addition is enough to spread clients.
constexpr double kSpreadOfAWish = 0.05;
constexpr unsigned kMaximumDoublings = 16;

constexpr std::array kBusyStatuses{429, 502, 503, 504};

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

bool isBusyStatus(int status) {
    return std::find(kBusyStatuses.begin(), kBusyStatuses.end(), status) != kBusyStatuses.end();
}

// Seconds, or a date.
std::optional<std::chrono::seconds> retryAfterOf(const https::HTTPResponse& response) {
    const auto text = response.header("Retry-After");
    if (!text) return std::nullopt;
    std::uint32_t seconds = 0;
    const auto [end, error] = std::from_chars(text->data(), text->data() + text->size(), seconds);
    if (error == std::errc{} && end == text->data() + text->size()) return std::chrono::seconds(seconds);
    if (error == std::errc::result_out_of_range) return std::chrono::seconds::max();

    std::tm date{};
    const char* const rest = strptime(text->c_str(), "%a, %d %b %Y %H:%M:%S GMT", &date);
    if (rest == nullptr || *rest != '\0') return std::nullopt;
    return std::chrono::seconds(std::max<std::time_t>(timegm(&date) - std::time(nullptr), 0));
}

}  // namespace pinwell::retrieval
