// Lookups in progress: groups of items at the record service, each on its own thread.
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

/// The maximum number of groups at once. One is enough if the service responds; the others are for slow
/// responses.
inline constexpr std::size_t kMostGroups = 4;

class Lookups {
  public:
    using Take = std::function<void(std::vector<ItemRef> group, std::vector<retrieval::Answer> answers)>;

    /// `take` gets each group with its answers, on a thread of this object.
    Lookups(const Platform& platform, Take take);

    /// Cancels the running lookups, and waits for them.
    ~Lookups();
    Lookups(const Lookups&) = delete;
    Lookups& operator=(const Lookups&) = delete;

    /// Asks for the records of at most kNamesPerRequest items. Returns at once.
    void ask(std::vector<ItemRef> group, std::optional<Clock::time_point> deadline);

    /// The running lookups end soon, and all later ones too.
    void cancel() { cancellation_.cancel(); }

  private:
    retrieval::Cancellation cancellation_;
    retrieval::RecordService service_;
    const Take take_;
    Workers threads_{kMostGroups};  // last: they use all of the above
};

}  // namespace pinwell::batch
