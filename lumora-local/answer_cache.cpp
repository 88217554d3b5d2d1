#include "answer_cache.h"

#include <utility>

namespace pinwell::lumora {
namespace {

constexpr std::size_t kLargestShare = 100;

std::string cacheKey(Environment environment, std::string_view key) {
    std::string whole(1, environment == Environment::production ? 'p' : 'd');
    return whole += key;
}

std::size_t weightOf(const std::string& key, const KeptAnswer& answer) {
    std::size_t weight = key.size() + answer.text.size();
    for (const std::string& name : answer.names) weight += sizeof(std::string) + name.size();
    return weight;
}

}  // namespace

bool AnswerCache::moveTo(std::uint64_t state) {
    if (state < state_) return false;
    if (state > state_) {
        places_.clear();
        entries_.clear();
        bytes_ = 0;
        state_ = state;
    }
    return true;
}

std::shared_ptr<const KeptAnswer> AnswerCache::find(std::uint64_t state, Environment environment,
                                                    std::string_view key) {
    const std::string whole = cacheKey(environment, key);
    const std::lock_guard lock(mutex_);
    if (!moveTo(state)) return nullptr;
    const auto place = places_.find(whole);
    if (place == places_.end()) return nullptr;
    entries_.splice(entries_.begin(), entries_, place->second);
    return place->second->answer;
}

void AnswerCache::insert(std::uint64_t state, Environment environment, std::string_view key,
                         std::shared_ptr<const KeptAnswer> answer) {
    std::string whole = cacheKey(environment, key);
    const std::size_t weight = weightOf(whole, *answer);
    if (weight > limits_.bytes / kLargestShare) return;
    const std::lock_guard lock(mutex_);
    if (!moveTo(state) || places_.contains(whole)) return;
    entries_.push_front({std::move(whole), std::move(answer), weight});
    places_.emplace(entries_.front().key, entries_.begin());
    bytes_ += weight;
    while (bytes_ > limits_.bytes || entries_.size() > limits_.entries) dropOldest();
}

void AnswerCache::dropOldest() {
    const Entry& oldest = entries_.back();
    bytes_ -= oldest.weight;
    places_.erase(oldest.key);
    entries_.pop_back();
}

std::size_t AnswerCache::count() const {
    const std::lock_guard lock(mutex_);
    return entries_.size();
}

std::size_t AnswerCache::bytes() const {
    const std::lock_guard lock(mutex_);
    return bytes_;
}

}  // namespace pinwell::lumora
