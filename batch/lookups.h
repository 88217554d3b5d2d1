// Lookups under way: groups of items at the record service, each on a thread of its own.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "batch/item.h"
#include "batch/workers.h"
#include "retrieval/record_service.h"

namespace pinwell::batch {

/// The most groups at once. One is enough as long as it is answered; the others are for when it is not.
inline constexpr std::size_t kMostGroups = 4;

class Lookups {
  public:
    using Take = std::function<void(std::vector<ItemRef> group, std::vector<retrieval::Answer> answers)>;

    /// `take` gets each group with its answers, on a thread of this object's own.
    Lookups(const Platform& platform, Take take);

    /// Cancels what is under way, and waits for it.
    ~Lookups();
    Lookups(const Lookups&) = delete;
    Lookups& operator=(const Lookups&) = delete;

    /// Asks for the records of at most kNamesPerRequest items. Returns at once.
    void ask(std::vector<ItemRef> group, std::optional<Clock::time_point> deadline);

    /// What is under way ends soon, and so does all that is asked later.
    void cancel() { cancellation_.cancel(); }

  private:
    retrieval::Cancellation cancellation_;
    retrieval::RecordService service_;
    const Take take_;
    Workers threads_{kMostGroups};  // last: they use all of the above
};

}  // namespace pinwell::batch
