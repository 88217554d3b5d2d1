// A run over many paths: parallel reading, one series of lookups, one verdict for each path.
#pragma once

#include <vector>

#include "gate/options.h"
#include "gate/result.h"
#include "gate/ticket_directory.h"
#include "src/platform.h"

namespace pinwell::gate {

/// One result for each path, in their order. `tickets` is null without --tickets.
std::vector<Result> judgeAll(const std::vector<std::string>& paths, const Options& options,
                             const TicketDirectory* tickets, const Platform& platform);

/// The exit status of a run: the status of the gravest verdict.
int exitStatusOf(const std::vector<Result>& results);

}  // namespace pinwell::gate
