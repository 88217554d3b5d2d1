// The batch itself: takes paths from the list, passes artefacts to threads and lookups to the record service,
// and reports each artefact when it ends.
//
// One thread decides everything, in a loop around poll(2). The others do the work that it assigns, and put
// the results in a queue. Between two turns of the loop an artefact is in one place: with a worker, in the
// queue for a lookup, with the record service, waiting for its retry, or in the queue for its second half.
#pragma once

#include <cstddef>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <variant>
#include <vector>

#include "companion/streams.h"
#include "report.h"
#include "retrieval/artefact_run.h"
#include "retrieval/record_service.h"
#include "settings.h"
#include "workers.h"

namespace pinwell::batch {

using retrieval::Clock;

/// The maximum number of artefacts held with all their data, and the maximum number of all, with the waiting
/// ones.
inline constexpr std::size_t kMostInWork = 512;
inline constexpr std::size_t kMostBegun = 16384;

class Coordinator {
  public:
    /// Called by the coordinator, on its own thread.
    struct Events {
        /// Whether to work on the artefact at this path; false if it belongs to another part, or was named
        /// before.
        std::function<bool(const std::string& path)> isWanted;
        /// `filesState` is that of ArtefactRun; empty if the artefact was not begun.
        std::function<void(const Report& report, const std::string& filesState)> ended;
        /// Whether an earlier run has already done this artefact. On a worker's thread.
        std::function<bool(const std::string& path, const retrieval::ArtefactRun& run)> isDoneBefore;
        std::function<void()> wasDoneBefore;
        /// Once in each turn: how many have begun and not ended.
        std::function<void(std::size_t inWork)> turned;
    };

    /// `signals` is readable after a signal that ends the run (signalfd(2)).
    Coordinator(const Settings& settings, const Platform& platform, companion::PathList& paths,
                const base::FileDescriptor& signals, Events events);
    ~Coordinator();
    Coordinator(const Coordinator&) = delete;
    Coordinator& operator=(const Coordinator&) = delete;

    /// Works on the whole list. Returns the signal that ended it, if any.
    std::optional<int> run();

    /// Whether the list held any path.
    bool hasSeenPaths() const noexcept { return hasSeenPaths_; }

    /// The error that stopped reading the list.
    const std::optional<base::Error>& listError() const noexcept { return paths_.error(); }

  private:
    struct Item;    // an artefact in progress
    class Lookups;  // groups of them at the record service
    using ItemRef = std::shared_ptr<Item>;
    struct Worked {
        ItemRef item;
        std::optional<retrieval::Outcome> outcome;  // `nullopt`: a record must be looked up
    };
    struct Answered {
        std::vector<ItemRef> group;
        std::vector<retrieval::Answer> answers;
    };
    using Result = std::variant<Worked, Answered>;

    void turn();
    bool isDone() const;
    void waitForNews();
    int millisecondsToWait() const;
    void takeSignal();
    void takeResults();
    void takeWorked(const Worked& worked);
    void takeAnswers(Answered answered);
    void takeAnswer(const ItemRef& item, retrieval::Answer answer, double chance);
    bool isToBeTriedAgain(const ItemRef& item, double chance);
    void wait(const ItemRef& item, Clock::time_point due);
    void waitNoMore(Item& item);
    void endOverdue();
    void endAllUndone(retrieval::Cause cause);
    void startLookups();
    void startWork();
    bool beginNext();
    void hand(const ItemRef& item, std::function<std::optional<retrieval::Outcome>(Item&)> work,
              bool isUrgent);
    void end(const ItemRef& item, const retrieval::Outcome& outcome);
    void endUnbegun(const std::string& path, retrieval::Cause cause);
    void put(Result result);
    std::size_t inWork() const noexcept { return begun_ - waitingItems_; }

    const Settings& settings_;
    const Platform platform_;
    companion::PathList& paths_;
    const base::FileDescriptor& signals_;
    const Events events_;
    const std::optional<Clock::time_point> deadline_;

    bool hasSeenPaths_ = false;
    companion::PathList::State list_ = companion::PathList::State::path;
    std::optional<int> signal_;
    bool isOver_ = false;  // no more artefacts begin

    std::size_t begun_ = 0;   // and not ended
    std::size_t atWork_ = 0;  // with the workers
    std::size_t groups_ = 0;  // with the record service
    std::optional<Clock::time_point> lastGroupBegan_;
    std::deque<ItemRef> toLookUp_;
    std::optional<Clock::time_point> firstToLookUp_;  // when the first one came
    std::deque<ItemRef> toFinish_;
    std::multimap<Clock::time_point, ItemRef> waiting_;  // some may have ended
    std::size_t waitingItems_ = 0;                       // the ones that have not ended
    std::deque<std::weak_ptr<Item>> byDeadline_;

    WakeUp news_;
    std::mutex mutex_;
    std::vector<Result> results_;

    Workers workers_;
    std::unique_ptr<Lookups> lookups_;  // made when first needed
};

}  // namespace pinwell::batch
