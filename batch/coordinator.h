// The batch itself: takes paths from the list, hands artefacts to threads and lookups to the record service,
// and reports each one as it ends.
//
// One thread decides everything, in a loop around poll(2); the others work on what they are given and put the
// result in a queue. Between two turns of the loop an artefact is in one place: with a worker, in the queue
// for a lookup, with the record service, waiting for its next try, or in the queue for its second half.
#pragma once

#include <cstddef>
#include <deque>
#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <variant>
#include <vector>

#include "batch/item.h"
#include "batch/lookups.h"
#include "batch/settings.h"
#include "batch/wake_up.h"
#include "batch/workers.h"
#include "companion/path_list.h"

namespace pinwell::batch {

/// The most artefacts that are held with all that was read of them, and the most at all, waiting ones
/// included.
inline constexpr std::size_t kMostInWork = 512;
inline constexpr std::size_t kMostBegun = 16384;

class Coordinator {
  public:
    /// What the coordinator tells, on its own thread.
    struct Events {
        /// Whether the artefact at this path is to be worked on; false for another part's, and for one that
        /// was named before.
        std::function<bool(const std::string& path)> isWanted;
        /// `filesState` is as ArtefactRun has it; empty if the artefact was not begun.
        std::function<void(const Report& report, const std::string& filesState)> ended;
        /// Whether an earlier run has done what was begun. On a worker's thread.
        std::function<bool(const std::string& path, const retrieval::ArtefactRun& run)> isDoneBefore;
        std::function<void()> wasDoneBefore;
        /// Once a turn: how many have begun and have not ended.
        std::function<void(std::size_t inWork)> turned;
    };

    /// `signals` is readable when a signal has come that ends the run (signalfd(2)).
    Coordinator(const Settings& settings, const Platform& platform, companion::PathList& paths,
                const foundation::FileDescriptor& signals, Events events);
    ~Coordinator();
    Coordinator(const Coordinator&) = delete;
    Coordinator& operator=(const Coordinator&) = delete;

    /// Works on all of the list. Returns the signal that ended it, if one did.
    std::optional<int> run();

    /// Whether the list held a path at all.
    bool hasSeenPaths() const noexcept { return hasSeenPaths_; }

    /// Why the list could not be read to its end.
    const std::optional<foundation::Error>& listError() const noexcept { return paths_.error(); }

  private:
    struct Worked {
        ItemRef item;
        std::optional<retrieval::Outcome> outcome;  // `nullopt`: a record is to be looked up
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
    const foundation::FileDescriptor& signals_;
    const Events events_;
    const std::optional<Clock::time_point> deadline_;

    bool hasSeenPaths_ = false;
    companion::PathList::State list_ = companion::PathList::State::path;
    std::optional<int> signal_;
    bool isOver_ = false;  // nothing more is begun

    std::size_t begun_ = 0;   // and not ended
    std::size_t atWork_ = 0;  // with the workers
    std::size_t groups_ = 0;  // with the record service
    std::optional<Clock::time_point> lastGroupBegan_;
    std::deque<ItemRef> toLookUp_;
    std::optional<Clock::time_point> firstToLookUp_;  // since when there are any
    std::deque<ItemRef> toFinish_;
    std::multimap<Clock::time_point, ItemRef> waiting_;  // some of which may have ended
    std::size_t waitingItems_ = 0;                       // those that have not
    std::deque<std::weak_ptr<Item>> byDeadline_;

    WakeUp news_;
    std::mutex mutex_;
    std::vector<Result> results_;

    Workers workers_;
    std::optional<Lookups> lookups_;  // made when first needed
};

}  // namespace pinwell::batch
