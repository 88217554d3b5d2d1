// One artefact of a batch in progress.
#pragma once

#include <chrono>
#include <memory>
#include <optional>
#include <string>

#include "batch/report.h"
#include "retrieval/record_service.h"
#include "retrieval/artefact_run.h"
#include "retrieval/retry_policy.h"

namespace pinwell::batch {

using retrieval::Clock;

/// Belongs to the coordinator's thread. While a worker has it (`isAtWork`), `run` and `answer` belong to the
/// worker.
struct Item {
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
    std::optional<foundation::Error> lastError;
};

using ItemRef = std::shared_ptr<Item>;

}  // namespace pinwell::batch
