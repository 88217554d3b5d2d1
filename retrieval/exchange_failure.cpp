#include "retrieval/exchange_failure.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <ctime>
#include <string>

namespace pinwell::retrieval {
namespace {

// Statuses of a gateway or of an overloaded service: they say nothing about the record.
constexpr std::array kBusyStatuses{429, 502, 503, 504};

}  // namespace

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

namespace {

foundation::Error busyError(const https::HTTPResponse& response) {
    return {foundation::kURLErrorDomain, static_cast<std::int64_t>(https::URLErrorCode::badServerResponse),
            "The host \"" + response.url.host() + "\" answered with status " +
                std::to_string(response.status) + " (" +
                https::localizedStringForStatusCode(response.status) + ")."};
}

}  // namespace

std::optional<Answer> failureOf(const Exchange& exchange) {
    Answer answer;
    answer.messages = exchange.messages;
    if (exchange.error) {
        answer.kind = exchange.serverWasRefused ? Answer::Kind::untrusted : Answer::Kind::unreachable;
        answer.error = exchange.error;
        return answer;
    }
    if (exchange.response && isBusyStatus(exchange.response->status)) {
        answer.retryAfter = retryAfterOf(*exchange.response);
        answer.error = busyError(*exchange.response);
        return answer;
    }
    if (exchange.body.empty()) {
        answer.response = exchange.response;
        return answer;
    }
    return std::nullopt;
}

}  // namespace pinwell::retrieval
