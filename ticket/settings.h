// What pinwell-ticket was asked to do.
#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <vector>

#include "companion/streams.h"
#include "retrieval/retry_policy.h"

namespace pinwell::ticket_files {

using Seconds = std::chrono::duration<double>;

struct Settings {
    std::vector<std::string> arguments;

    std::optional<std::string> from;  // of fetch and request: names, one a line; "-": standard input
    bool isZeroTerminated = false;
    std::optional<std::string> output;   // of fetch and request a directory, of extract a file
    std::optional<std::string> tickets;  // of attach: the directory
    std::optional<std::string> ticket;   // of attach: one file for all
    retrieval::RetryPolicy retry;
    Seconds wait{0};
    std::optional<Seconds> deadline;

    // Of request.
    std::optional<std::string> url;
    std::optional<std::string> certificate;
    std::optional<std::string> key;
    std::optional<std::string> label;
    std::optional<std::string> comment;
    bool reinstates = false;

    bool asJson = false;
    bool isQuiet = false;
    bool isVerbose = false;
    companion::ColorWhen color = companion::ColorWhen::automatic;
};

}  // namespace pinwell::ticket_files
