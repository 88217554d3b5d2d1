// The settings of a batch, and the command line that they come from.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "companion/command_line.h"
#include "retrieval/retry_policy.h"

namespace pinwell::batch {

inline constexpr const char* kProgramName = "pinwell-batch";

using companion::Seconds;

struct Settings {
    std::uint8_t operation = 0;  // kOperationStaple or kOperationValidate

    // The list.
    std::vector<std::string> paths;
    std::optional<std::string> from;  // a file with one path on each line; "-": standard input
    bool isZeroTerminated = false;    // a zero byte ends each of its paths, not a newline
    std::uint64_t shard = 1;          // of `shards` parts of the list, counted from 1
    std::uint64_t shards = 1;

    // How.
    std::uint64_t jobs = 1;
    retrieval::RetryPolicy retry;
    Seconds wait{0};
    std::optional<Seconds> timeout;   // of one artefact
    std::optional<Seconds> deadline;  // of all
    std::optional<std::string> journal;
    bool keepsTemporaryFiles = false;

    // Output.
    bool asJson = false;
    bool isQuiet = false;
    bool isVerbose = false;
    companion::ColorWhen color = companion::ColorWhen::automatic;
    std::optional<std::string> junit;
};

struct CommandLine {
    /// The process must end with this status: the help or an error was printed.
    std::optional<int> exitStatus;

    Settings settings{};
};

CommandLine readCommandLine(int argc, char** argv);

}  // namespace pinwell::batch
