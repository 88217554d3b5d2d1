// One artefact of a batch on its way.
#pragma once

#include <chrono>
#include <memory>
#include <optional>
#include <string>

#include "batch/report.h"
#include "retrieval/answer.h"
#include "retrieval/artefact_run.h"
#include "retrieval/retry_policy.h"

namespace pinwell::batch {

using retrieval::Clock;

/// Belongs to the coordinator's thread, except while a worker has it (`isAtWork`): then run and answer are
/// the worker's.
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
    unsigned failures = 0;  // of them, those that came to nothing
    unsigned polls = 0;     // of them, those that said that there is no ticket yet
    std::optional<Clock::time_point> notIssuedSince;
    std::optional<foundation::Error> lastError;
};

using ItemRef = std::shared_ptr<Item>;

}  // namespace pinwell::batch
