// Keeps records and whole responses in memory while the store does not change.
//
// An entry is valid for one state of the store, which has a number (RecordSource::changeCounter). Each
// lookup first reads the number. A greater number empties the cache. A record that was read for a
// smaller number is not added. So no lookup returns a state older than the latest change known to its
// store.
#pragma once

#include <cstdint>
#include <list>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "record_name.h"

namespace pinwell::lumora {

/// A record in the form of a response, or the body of a whole response.
struct KeptAnswer {
    std::string text;
    std::vector<std::string> names{};  // of the records in a whole response
};

/// For any thread.
class AnswerCache {
  public:
    struct Limits {
        std::size_t entries = 50'000;
        std::size_t bytes = std::size_t{32} * 1024 * 1024;  // of keys, texts and names
    };

    AnswerCache() : AnswerCache(Limits{}) {}
    explicit AnswerCache(Limits limits) : limits_(limits) {}

    /// `key` is a record's name or the body of a request. Returns null if there is no entry.
    std::shared_ptr<const KeptAnswer> find(std::uint64_t state, Environment environment,
                                           std::string_view key);

    /// Removes the least recently used entries first. An entry may take a hundredth of the capacity at most.
    void insert(std::uint64_t state, Environment environment, std::string_view key,
                std::shared_ptr<const KeptAnswer> answer);

    std::size_t count() const;
    std::size_t bytes() const;

  private:
    struct Entry {
        std::string key;
        std::shared_ptr<const KeptAnswer> answer;
        std::size_t weight = 0;
    };
    using Entries = std::list<Entry>;

    /// With the lock held. Returns whether the cache is valid for this state now.
    bool moveTo(std::uint64_t state);
    void dropOldest();

    const Limits limits_;
    mutable std::mutex mutex_;
    std::uint64_t state_ = 0;
    std::size_t bytes_ = 0;
    Entries entries_;  // in the order of their last use, newest first
    std::unordered_map<std::string_view, Entries::iterator> places_;  // the keys are the entries' own
};

}  // namespace pinwell::lumora
