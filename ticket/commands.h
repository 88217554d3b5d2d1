// The commands of pinwell-ticket and their settings. Each command prints the result of each of its arguments,
// and returns the exit status.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "companion/command_line.h"
#include "companion/streams.h"
#include "https/session.h"
#include "retrieval/retry_policy.h"
#include "src/platform.h"

namespace pinwell::ticket_files {

inline constexpr const char* kProgramName = "pinwell-ticket";

using companion::Seconds;

struct Settings {
    std::vector<std::string> arguments;

    std::optional<std::string> from;  // for fetch and request: names, one a line; "-": standard input
    bool isZeroTerminated = false;
    std::optional<std::string> output;   // for fetch and request a directory, for extract a file
    std::optional<std::string> tickets;  // for attach: the directory
    std::optional<std::string> ticket;   // for attach: one file for all artefacts
    retrieval::RetryPolicy retry;
    Seconds wait{0};
    std::optional<Seconds> deadline;

    // For request.
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

/// Prints the record name of each artefact. No network.
int hash(const Settings& settings, const Platform& platform);

/// Fetches the tickets of records into a directory, with an index.
int fetch(const Settings& settings, const Platform& platform);

/// Has a record service issue tickets for artefacts, and keeps them in a directory, with an index. `identity`
/// is the client's.
int request(const Settings& settings, const Platform& platform,
            std::shared_ptr<const https::ClientIdentity> identity);

/// Attaches tickets from files. No network.
int attach(const Settings& settings, const Platform& platform);

/// Writes the ticket of an artefact to a file.
int extract(const Settings& settings, const Platform& platform);

/// Removes the ticket of each artefact.
int remove(const Settings& settings, const Platform& platform);

}  // namespace pinwell::ticket_files
