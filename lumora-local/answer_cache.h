// Records and whole answers, ready in memory as long as nothing changes.
//
// An entry is held for one state of the store, which has a number (RecordSource::changeCounter). Whoever
// looks something up asks for the number first. A greater number empties the cache; a record that was read
// for a smaller number is not taken. So no lookup finds what was true before a change that its store knows
// of.
#pragma once

#include <cstdint>
#include <list>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "lumora-local/environment.h"

namespace pinwell::lumora {

/// A record as answers have it, or the body of a whole answer.
struct KeptAnswer {
    std::string text;
    std::vector<std::string> names{};  // of the records in a whole answer
};

/// May be used from any thread.
class AnswerCache {
  public:
    struct Limits {
        std::size_t entries = 50'000;
        std::size_t bytes = std::size_t{32} * 1024 * 1024;  // of keys, texts and names
    };

    AnswerCache() : AnswerCache(Limits{}) {}
    explicit AnswerCache(Limits limits) : limits_(limits) {}

    /// `key` is a record's name or the body of a request. Null if there is nothing for it.
    std::shared_ptr<const KeptAnswer> find(std::uint64_t state, Environment environment,
                                           std::string_view key);

    /// What was used longest ago makes room. What is larger than a hundredth of all room is not taken.
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

    /// With the lock held; whether the cache is about this state now.
    bool moveTo(std::uint64_t state);
    void dropOldest();

    const Limits limits_;
    mutable std::mutex mutex_;
    std::uint64_t state_ = 0;
    std::size_t bytes_ = 0;
    Entries entries_;  // the one that was used last comes first
    std::unordered_map<std::string_view, Entries::iterator> places_;  // the keys are the entries' own
};

}  // namespace pinwell::lumora
