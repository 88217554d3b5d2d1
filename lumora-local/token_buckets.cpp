#include "lumora-local/token_buckets.h"

#include <algorithm>

namespace pinwell::lumora {

std::optional<std::int64_t> TokenBuckets::take(const std::string& name) {
    const std::lock_guard lock(mutex_);
    const Clock::time_point now = now_();
    const auto place = places_.find(name);
    if (place != places_.end()) {
        buckets_.splice(buckets_.begin(), buckets_, place->second);
    } else {
        if (buckets_.size() >= clients_) {
            places_.erase(buckets_.back().name);
            buckets_.pop_back();
        }
        buckets_.push_front({name, now});
        places_[name] = buckets_.begin();
    }
    Clock::time_point& fullAt = buckets_.front().fullAt;
    const Clock::time_point after = std::max(fullAt, now) + allowance_.interval;
    const Clock::time_point latest = now + allowance_.interval * allowance_.burst;
    if (after > latest) {
        const auto wait = std::chrono::ceil<std::chrono::seconds>(after - latest);
        return std::max<std::int64_t>(wait.count(), 1);
    }
    fullAt = after;
    return std::nullopt;
}

std::size_t TokenBuckets::size() const {
    const std::lock_guard lock(mutex_);
    return buckets_.size();
}

}  // namespace pinwell::lumora
