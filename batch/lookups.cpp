#include "batch/lookups.h"

#include <utility>

namespace pinwell::batch {

Lookups::Lookups(const Platform& platform, Take take) : service_(platform), take_(std::move(take)) {}

Lookups::~Lookups() {
    cancellation_.cancel();
}

void Lookups::ask(std::vector<ItemRef> group, std::optional<Clock::time_point> deadline) {
    // The names are read here: the rest of an item may belong to another thread later.
    std::vector<std::string> names;
    for (const ItemRef& item : group) names.push_back(item->run->recordName());
    threads_.add([this, deadline, names = std::move(names), group = std::move(group)]() mutable {
        std::vector<retrieval::Answer> answers = service_.lookUp(names, cancellation_, deadline);
        take_(std::move(group), std::move(answers));
    });
}

}  // namespace pinwell::batch
