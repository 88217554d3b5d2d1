#include "coordinator.h"

#include <poll.h>

#include <algorithm>
#include <array>
#include <utility>

#include "companion/process.h"
#include "src/DownloadDelegate.h"
#include "src/messages.h"

namespace pinwell::batch {

using retrieval::Cause;
using retrieval::Outcome;

namespace {

// How long an incomplete group waits for more items, and how long a group may be at the service before
// another one is sent.
constexpr std::chrono::milliseconds kGathering{20};
constexpr std::chrono::seconds kPatienceWithAGroup{1};

// The maximum number of groups at once. One is enough if the service responds; the others are for slow
// responses.
constexpr std::size_t kMostGroups = 4;

Clock::duration clockTime(Seconds seconds) {
    return std::chrono::duration_cast<Clock::duration>(seconds);
}

std::optional<Clock::time_point> earlier(std::optional<Clock::time_point> a,
                                         std::optional<Clock::time_point> b) {
    if (!a || !b) return a ? a : b;
    return std::min(*a, *b);
}

}  // namespace

// Belongs to the coordinator's thread. While a worker has it (`isAtWork`), `run` and `answer` belong to the
// worker.
struct Coordinator::Item {
    std::string path;
    std::unique_ptr<retrieval::ArtefactRun> run;
    retrieval::Answer answer;

    Clock::time_point begun;
    std::optional<Clock::time_point> deadline;
    bool isAtWork = false;
    bool wasDoneBefore = false;  // by an earlier run
    bool isWaiting = false;
    bool hasEnded = false;

    unsigned attempts = 0;  // lookups
    unsigned failures = 0;  // lookups without a result
    unsigned polls = 0;     // lookups whose result was: no ticket yet
    std::optional<Clock::time_point> notIssuedSince;
    std::optional<base::Error> lastError;
};

// Lookups in progress: groups of items at the record service, each on its own thread.
class Coordinator::Lookups {
  public:
    using Take = std::function<void(std::vector<ItemRef> group, std::vector<retrieval::Answer> answers)>;

    // `take` gets each group with its answers, on a thread of this object.
    Lookups(const Platform& platform, Take take) : service_(platform), take_(std::move(take)) {}

    // Cancels the running lookups, and waits for them.
    ~Lookups() { cancellation_.cancel(); }
    Lookups(const Lookups&) = delete;
    Lookups& operator=(const Lookups&) = delete;

    // Asks for the records of at most kNamesPerRequest items. Returns at once.
    void ask(std::vector<ItemRef> group, std::optional<Clock::time_point> deadline) {
        // The names are read here: the rest of an item may belong to another thread later.
        std::vector<std::string> names;
        for (const ItemRef& item : group) names.push_back(item->run->recordName());
        threads_.add([this, deadline, names = std::move(names), group = std::move(group)]() mutable {
            std::vector<retrieval::Answer> answers = service_.lookUp(names, cancellation_, deadline);
            take_(std::move(group), std::move(answers));
        });
    }

    // The running lookups end soon, and all later ones too.
    void cancel() { cancellation_.cancel(); }

  private:
    retrieval::Cancellation cancellation_;
    retrieval::RecordService service_;
    const Take take_;
    Workers threads_{kMostGroups};  // last: they use all of the above
};

Coordinator::Coordinator(const Settings& settings, const Platform& platform, companion::PathList& paths,
                         const base::FileDescriptor& signals, Events events)
    : settings_(settings),
      platform_(platform),
      paths_(paths),
      signals_(signals),
      events_(std::move(events)),
      deadline_(settings.deadline ? std::optional(Clock::now() + clockTime(*settings.deadline))
                                  : std::nullopt),
      workers_(settings.jobs) {}

Coordinator::~Coordinator() = default;

std::optional<int> Coordinator::run() {
    while (true) {
        turn();
        if (isDone()) return signal_;
        waitForNews();
    }
}

bool Coordinator::isDone() const {
    return begun_ == 0 &&
           (list_ == companion::PathList::State::end || list_ == companion::PathList::State::broken ||
            (isOver_ && list_ == companion::PathList::State::wait));
}

void Coordinator::turn() {
    takeSignal();
    takeResults();
    endOverdue();
    if (isOver_) endAllUndone(signal_ ? Cause::interrupted : Cause::timedOut);
    startWork();
    startLookups();
    events_.turned(begun_);
}

void Coordinator::waitForNews() {
    std::array<pollfd, 3> sources{pollfd{signals_.get(), POLLIN, 0}, pollfd{news_.descriptor(), POLLIN, 0},
                                  pollfd{-1, POLLIN, 0}};
    if (list_ == companion::PathList::State::wait && begun_ < kMostBegun && inWork() < kMostInWork)
        sources.at(2).fd = paths_.descriptor();
    static_cast<void>(::poll(sources.data(), sources.size(), millisecondsToWait()));
}

int Coordinator::millisecondsToWait() const {
    auto next = isOver_ ? std::nullopt : deadline_;
    if (!waiting_.empty()) next = earlier(next, waiting_.begin()->first);
    if (!byDeadline_.empty())
        if (const ItemRef first = byDeadline_.front().lock()) next = earlier(next, first->deadline);
    if (firstToLookUp_) {
        if (groups_ == 0) next = earlier(next, *firstToLookUp_ + kGathering);
        if (groups_ > 0 && groups_ < kMostGroups)
            next = earlier(next, *lastGroupBegan_ + kPatienceWithAGroup);
    }
    if (!next) return -1;
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(*next - Clock::now());
    constexpr std::chrono::milliseconds kLongest{60'000};
    return static_cast<int>(std::clamp(left, std::chrono::milliseconds(0), kLongest).count());
}

void Coordinator::takeSignal() {
    const auto number = companion::nextEndingSignal(signals_);
    if (!number) return;
    if (!signal_) signal_ = number;
    isOver_ = true;
    if (lookups_) lookups_->cancel();
}

void Coordinator::put(Result result) {
    {
        const std::lock_guard lock(mutex_);
        results_.push_back(std::move(result));
    }
    news_.raise();
}

void Coordinator::takeResults() {
    news_.clear();
    std::vector<Result> results;
    {
        const std::lock_guard lock(mutex_);
        results.swap(results_);
    }
    for (Result& result : results) {
        if (auto* const worked = std::get_if<Worked>(&result))
            takeWorked(*worked);
        else
            takeAnswers(std::move(std::get<Answered>(result)));
    }
}

void Coordinator::takeWorked(const Worked& worked) {
    --atWork_;
    worked.item->isAtWork = false;
    if (worked.item->wasDoneBefore) {
        worked.item->hasEnded = true;
        --begun_;
        events_.wasDoneBefore();
        return;
    }
    if (worked.outcome) {
        end(worked.item, *worked.outcome);
        return;
    }
    if (worked.item->deadline && Clock::now() >= *worked.item->deadline) {
        end(worked.item, {kExitNoHost, Cause::timedOut});
        return;
    }
    if (!firstToLookUp_) firstToLookUp_ = Clock::now();
    toLookUp_.push_back(worked.item);
}

void Coordinator::takeAnswers(Answered answered) {
    --groups_;
    const double chance = retrieval::randomChance();  // one for all, so that the group stays together
    for (std::size_t i = 0; i < answered.group.size(); ++i)
        if (!answered.group[i]->hasEnded)
            takeAnswer(answered.group[i], std::move(answered.answers[i]), chance);
}

void Coordinator::takeAnswer(const ItemRef& item, retrieval::Answer answer, double chance) {
    ++item->attempts;
    item->answer = std::move(answer);
    if (item->answer.error) item->lastError = item->answer.error;
    if (!isOver_ && isToBeTriedAgain(item, chance)) {
        item->answer = {};
        item->run->release();
        return;
    }
    toFinish_.push_back(item);
}

bool Coordinator::isToBeTriedAgain(const ItemRef& item, double chance) {
    const auto now = Clock::now();
    switch (item->answer.kind) {
        case retrieval::Answer::Kind::untrusted:
            return false;
        case retrieval::Answer::Kind::unreachable:
            if (item->failures++ >= settings_.retry.retries) return false;
            wait(item, now + settings_.retry.delayAfter(item->failures, item->answer.retryAfter, chance));
            return true;
        case retrieval::Answer::Kind::answered:
            break;
    }
    if (settings_.wait.count() <= 0 || !item->answer.hasNoTicket()) return false;
    if (!item->notIssuedSince) item->notIssuedSince = now;
    const auto last = *item->notIssuedSince + clockTime(settings_.wait);
    if (now >= last) return false;
    wait(item, std::min(now + settings_.retry.pollDelayAfter(++item->polls, chance), last));
    return true;
}

void Coordinator::wait(const ItemRef& item, Clock::time_point due) {
    item->isWaiting = true;
    ++waitingItems_;
    waiting_.emplace(due, item);
}

void Coordinator::waitNoMore(Item& item) {
    if (std::exchange(item.isWaiting, false)) --waitingItems_;
}

// Artefacts begin one after another and have the same time limit, so the first is overdue first.
void Coordinator::endOverdue() {
    const auto now = Clock::now();
    if (deadline_ && now >= *deadline_ && !isOver_) {
        isOver_ = true;
        if (lookups_) lookups_->cancel();
    }
    while (!byDeadline_.empty()) {
        const ItemRef first = byDeadline_.front().lock();
        if (first && !first->hasEnded) {
            if (*first->deadline > now) return;
            // A running write is finished, and its result counts.
            if (!first->isAtWork) end(first, {kExitNoHost, Cause::timedOut});
        }
        byDeadline_.pop_front();
    }
}

void Coordinator::endAllUndone(Cause cause) {
    const int status = signal_ ? companion::kSignalBase + *signal_ : kExitNoHost;
    const auto endThese = [&](const std::deque<ItemRef>& items) {
        for (const ItemRef& item : items)
            if (!item->hasEnded) end(item, {status, cause});
    };
    endThese(std::exchange(toLookUp_, {}));
    endThese(std::exchange(toFinish_, {}));
    for (const auto& [due, item] : std::exchange(waiting_, {}))
        if (!item->hasEnded) end(item, {status, cause});
    firstToLookUp_.reset();
}

void Coordinator::startLookups() {
    const auto now = Clock::now();
    while (!waiting_.empty() && waiting_.begin()->first <= now) {
        const ItemRef item = std::move(waiting_.extract(waiting_.begin()).mapped());
        waitNoMore(*item);
        if (!firstToLookUp_) firstToLookUp_ = now;
        toLookUp_.push_back(item);
    }
    std::erase_if(toLookUp_, [](const ItemRef& item) { return item->hasEnded; });
    while (!toLookUp_.empty() && groups_ < kMostGroups) {
        const bool isFull = toLookUp_.size() >= retrieval::kNamesPerRequest;
        const bool mayGrow = atWork_ > 0 || list_ == companion::PathList::State::path;
        const bool isFirst = groups_ == 0 && (!mayGrow || now - *firstToLookUp_ >= kGathering);
        const bool isBesideASlowOne = groups_ > 0 && now - *lastGroupBegan_ >= kPatienceWithAGroup;
        if (!isFull && !isFirst && !isBesideASlowOne) return;

        const auto count = std::min(toLookUp_.size(), retrieval::kNamesPerRequest);
        std::vector<ItemRef> group(toLookUp_.begin(), toLookUp_.begin() + static_cast<std::ptrdiff_t>(count));
        toLookUp_.erase(toLookUp_.begin(), toLookUp_.begin() + static_cast<std::ptrdiff_t>(count));
        // Its last item decides the deadline.
        std::optional<Clock::time_point> deadline = group.front()->deadline;
        for (const ItemRef& item : group)
            if (deadline) deadline = std::max(*deadline, *item->deadline);
        if (!lookups_)
            lookups_ = std::make_unique<Lookups>(platform_, [this](auto items, auto answers) {
                put(Answered{std::move(items), std::move(answers)});
            });
        ++groups_;
        lastGroupBegan_ = now;
        lookups_->ask(std::move(group), earlier(deadline, deadline_));
    }
    if (toLookUp_.empty()) firstToLookUp_.reset();
}

void Coordinator::startWork() {
    const std::size_t mostAtWork = settings_.jobs * 2;  // one waiting for each one in work
    while (!toFinish_.empty() && atWork_ < mostAtWork) {
        const ItemRef item = std::move(toFinish_.front());
        toFinish_.pop_front();
        if (!item->hasEnded)
            hand(
                item, [](Item& one) { return one.run->end(one.answer); }, true);
    }
    while (isOver_ || (atWork_ < mostAtWork && begun_ < kMostBegun && inWork() < kMostInWork))
        if (!beginNext()) return;
}

// Returns false if there is no path now or later.
bool Coordinator::beginNext() {
    if (list_ == companion::PathList::State::end || list_ == companion::PathList::State::broken) return false;
    auto [state, path] = paths_.next();
    list_ = state;
    if (list_ != companion::PathList::State::path) return false;
    hasSeenPaths_ = true;
    if (!events_.isWanted(path)) return true;
    if (isOver_) {
        endUnbegun(path, signal_ ? Cause::interrupted : Cause::timedOut);
        return true;
    }
    const ItemRef item(std::make_unique<Item>());  // separate from its count, which weak references keep
    item->path = std::move(path);
    item->begun = Clock::now();
    if (settings_.timeout) {
        item->deadline = item->begun + clockTime(*settings_.timeout);
        byDeadline_.push_back(item);
    }
    ++begun_;
    hand(
        item,
        [this](Item& one) {
            one.run = std::make_unique<retrieval::ArtefactRun>(one.path, settings_.operation, platform_);
            const auto outcome = one.run->begin();
            one.wasDoneBefore = events_.isDoneBefore(one.path, *one.run);
            return outcome;
        },
        false);
    return true;
}

void Coordinator::hand(const ItemRef& item, std::function<std::optional<Outcome>(Item&)> work,
                       bool isUrgent) {
    ++atWork_;
    item->isAtWork = true;
    workers_.add(
        [this, item, work = std::move(work)] {
            auto outcome = work(*item);
            put(Worked{item, outcome});
        },
        isUrgent);
}

void Coordinator::end(const ItemRef& item, const Outcome& outcome) {
    item->hasEnded = true;
    --begun_;
    waitNoMore(*item);
    Report report;
    report.path = item->path;
    report.operation = nameOfOperation(settings_.operation);
    report.kind = item->run->kind();
    report.recordName = item->run->recordName();
    report.exitStatus = outcome.exitStatus;
    report.cause = outcome.cause;
    report.attempts = std::max(item->attempts, 1U);
    report.seconds = std::chrono::duration<double>(Clock::now() - item->begun).count();
    report.messages = item->run->messages();
    const bool wasCutShort = outcome.cause == Cause::timedOut || outcome.cause == Cause::interrupted;
    if (wasCutShort && item->lastError)
        report.messages.push_back(values::format("error is %@", item->lastError));
    const std::string filesState = item->run->filesState();
    item->run.reset();
    item->answer = {};
    events_.ended(report, filesState);
}

void Coordinator::endUnbegun(const std::string& path, Cause cause) {
    Report report;
    report.path = path;
    report.operation = nameOfOperation(settings_.operation);
    report.exitStatus = signal_ ? companion::kSignalBase + *signal_ : kExitNoHost;
    report.cause = cause;
    events_.ended(report, {});
}

}  // namespace pinwell::batch
