#include "lumora-local/refusal_log.h"

#include <exception>
#include <utility>

#include "foundation/format.h"

namespace pinwell::lumora {
namespace {

using foundation::format;

constexpr TokenBuckets::Allowance kPerClient{20, std::chrono::minutes(1)};
constexpr TokenBuckets::Allowance kOverall{100, std::chrono::seconds(10)};
constexpr std::size_t kClients = 1024;

}  // namespace

RefusalLog::RefusalLog(RecordStore& store, ErrorLog errorLog, TokenBuckets::Now now)
    : store_(store),
      errorLog_(std::move(errorLog)),
      perClient_(kPerClient, kClients, now),
      overall_(kOverall, 1, std::move(now)) {}

void RefusalLog::note(const std::string& client, const RefusedAttempt& attempt,
                      const std::string& why) noexcept {
    try {
        std::uint64_t leftOut = 0;
        {
            const std::lock_guard lock(mutex_);
            if (perClient_.take(client) || overall_.take("")) {
                ++leftOut_;
                return;
            }
            leftOut = std::exchange(leftOut_, 0);
        }
        Occasion occasion{foundation::Date::now(), client, std::nullopt, why, false};
        if (leftOut > 0) {
            occasion.comment += format(" (%llu more attempts before it are not in the log)",
                                       static_cast<unsigned long long>(leftOut));
        }
        store_.noteRefusal(attempt, occasion);
    } catch (const std::exception& error) {
        try {
            errorLog_(format("cannot note a refused attempt of %@: %s", client, error.what()));
        } catch (const std::exception&) {
            return;  // there is no one left to report to
        }
    }
}

}  // namespace pinwell::lumora
